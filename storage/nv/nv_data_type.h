// The data type of an NV item: members of little-endian words, and how a value turns from bytes into decimal numbers
// and back. Types are built by the loader of definitions, which checks them against the limits here.
#ifndef KRAL_STORAGE_NV_NV_DATA_TYPE_H
#define KRAL_STORAGE_NV_NV_DATA_TYPE_H

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace kral::nv {

inline constexpr size_t kLongestValue = 65536;

struct NvMember {
  std::string name;
  uint8_t width = 1;  // bytes: 1, 2, 4 or 8
  bool is_signed = false;
  uint32_t count = 1;  // elements

  size_t size() const { return size_t{width} * count; }
  bool operator==(const NvMember&) const = default;
};

// One form of a type. A type of several forms is told apart by the first number of a value.
struct NvForm {
  std::optional<uint64_t> selector;  // the variantType; nothing: of every value that no other form claims
  std::vector<NvMember> members;

  size_t size() const;
};

class NvDataType {
 public:
  NvDataType() = default;
  NvDataType(std::string name, std::vector<NvForm> forms, bool variable_size)
      : name_(std::move(name)), forms_(std::move(forms)), variable_size_(variable_size) {}

  // Bytes that nobody has defined: one array of them.
  static NvDataType Generic(size_t size);

  const std::string& name() const { return name_; }  // empty: an item's own
  const std::vector<NvForm>& forms() const { return forms_; }
  bool variable_size() const { return variable_size_; }  // the last member may have fewer elements
  size_t longest() const;                                // bytes

  // True when a value of so many bytes begins as these do and has a form of this type.
  bool Holds(std::span<const uint8_t> value) const;
  // Cuts what is longer than the form's size, as data fields are; nothing when it is too short.
  std::optional<std::vector<uint8_t>> Cut(std::span<const uint8_t> bytes) const;

  // "1,2,-3": decimal numbers, member by member. The value must be one that Holds.
  std::string ToText(std::span<const uint8_t> value) const;
  // The same with the names of the members: {"level", "1,2"}, {"offset", "-3"}.
  std::vector<std::pair<std::string, std::string>> ToMembers(std::span<const uint8_t> value) const;
  // Numbers separated by commas or blanks. Nothing when they do not fit; `problem` then tells the member.
  std::optional<std::vector<uint8_t>> FromText(std::string_view text, std::string& problem) const;

 private:
  const NvForm* FormOf(uint64_t first) const;
  const NvForm* FormOf(std::span<const uint8_t> bytes) const;
  bool FitsForm(const NvForm& form, size_t size) const;

  std::string name_;
  std::vector<NvForm> forms_;
  bool variable_size_ = false;
};

}  // namespace kral::nv

#endif

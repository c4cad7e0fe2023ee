// Items with their definitions, over the library's NV tool: how to find them, and what reading them comes to.
#ifndef KRAL_TOOLS_NV_NV_ITEMS_H
#define KRAL_TOOLS_NV_NV_ITEMS_H

#include <cstdint>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "tools/kral/nv/nv_options.h"
#include "tools/kral/session.h"

namespace kral::tool {

struct NvMember {
  std::string name;
  std::string type;  // "word16", or "signed word16"
  std::size_t count = 1;
};

struct NvForm {
  std::string selector;  // first number, unsigned, of the values that have this form; empty: all others
  std::vector<NvMember> members;
};

struct NvItem {
  std::optional<std::uint16_t> id;
  std::string path;  // empty: a numbered item
  std::string name;
  std::uint16_t max_index = 0;
  bool defined = true;  // false: nothing is known but its bytes
  std::vector<NvForm> forms;

  std::string Title() const;  // "453 FTM_MODE"
};

struct NvElement {
  std::uint16_t index = 0;
  std::vector<std::string> numbers;
};

struct NvReading {
  enum class Kind { kValue, kNoValue, kRefused };

  Kind kind = Kind::kValue;
  std::uint16_t status = 0;         // of a numbered item
  std::vector<std::uint8_t> bytes;  // of a numbered item without definition; of all others:
  std::vector<NvElement> elements;  // one, or those of an array that have a value

  bool has_value() const { return kind == Kind::kValue; }
};

class NvItems {
 public:
  // Loads the definition files; ToolError when one cannot be used.
  NvItems(Session& session, const NvOptions& options);

  const std::vector<NvItem>& all() const { return items_; }
  // By id, path or name. An id or a path that nobody defined is an item of bytes; ToolError for an unknown name.
  NvItem Find(const std::string& which) const;
  NvItem Find(std::uint16_t id) const;

  // Has the library keep what is read of items without definition, too, so that it is in the files that it writes.
  void KeepUndefined() { keeps_undefined_ = true; }
  // From the handset; ToolError when that goes wrong otherwise than by the handset's word on the item.
  NvReading Read(const NvItem& item);
  // What it is to hold, not sent yet: decimal numbers where it is defined, else bytes in hex, which are given back.
  // ToolError for what it cannot hold.
  std::vector<std::uint8_t> Set(const NvItem& item, std::uint16_t array_index, const std::string& value) const;
  // Sets and writes it.
  void Write(const NvItem& item, std::uint16_t array_index, const std::string& value);

  // Throws for any error code but 0 and those allowed.
  void Check(std::uint32_t code, const std::string& what, std::uint32_t allowed = 0) const;

 private:
  NvReading ReadFile(const NvItem& item);
  NvReading ReadDefined(const NvItem& item);
  NvReading ReadBytes(const NvItem& item);
  std::vector<NvElement> Elements(const NvItem& item) const;
  std::optional<std::string> Value(const NvItem& item, std::uint16_t array_index) const;
  void LoadFile(const std::string& file, bool dictionary);
  void ListItems();

  Session& session_;
  const NvOptions options_;
  bool keeps_undefined_ = false;
  std::vector<NvItem> items_;
  std::unordered_map<std::uint16_t, std::size_t> by_id_;
  std::unordered_map<std::string, std::size_t> by_text_;  // names and paths; the first of a name
};

std::string DescribeNvStatus(std::uint16_t status);
// Why there is no value: "status 5, never written".
std::string DescribeReading(const NvItem& item, const NvReading& reading);

}  // namespace kral::tool

#endif

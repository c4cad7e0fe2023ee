// Commands as definition files describe them: what a request is made of, and what its reply holds.
//
// A message is a tree: groups (records, words of bits, zlib streams) hold fields, which may be arrays. Every field that
// has a value of its own is a slot, numbered in the order of the definition; its elements are numbered through all
// arrays around it. Record 2 of a field "points" of at most 10 records of 4 levels each: "points[2].level[1]" is
// element 2 * 4 + 1 of the slot "points.level".
#ifndef KRAL_COMMANDS_DEFINED_DEFINITION_H
#define KRAL_COMMANDS_DEFINED_DEFINITION_H

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "commands/ftm/ftm_frame.h"

namespace kral::defined {

inline constexpr size_t kLongestMessage = size_t{64} << 10;  // also of what a zlib stream holds
inline constexpr uint32_t kMostElements = 64 << 10;          // of a slot, through all arrays
inline constexpr uint32_t kMostInAll = 1 << 20;              // elements of all slots of a message
inline constexpr size_t kMostSlots = 4096;                   // of a message
inline constexpr uint32_t kNoSlot = UINT32_MAX;

enum class Kind : uint8_t {
  kUnsigned,
  kSigned,
  kReal,
  kText,
  kBytes,
  kRecord,  // a group
  kBits,    // a group: its members share one word
  kPacked,  // a group: a zlib stream of its members
};

// A number of any kind, as bits: of a signed one the two's complement, of a real one a double's.
using Bits = uint64_t;

// Words for numbers, in the order of the file.
struct Enumeration {
  std::vector<std::pair<std::string, Bits>> values;

  const Bits* Find(std::string_view name) const;
  const std::string* NameOf(Bits value) const;
};

// An earlier number of the same group, or of one around it: that element of its slot that stands beside the field's.
struct Reference {
  uint32_t slot = kNoSlot;
  uint32_t depth = 0;  // of the group in which it is found
  std::string name;
};

struct Condition {
  Reference on;
  std::vector<Bits> values;
  bool is_not = false;
};

// How many elements, or bytes of a text, block or stream.
struct Extent {
  enum class Rule : uint8_t { kFixed, kCounted, kToEnd, kTerminated };
  Rule rule = Rule::kFixed;
  uint32_t most = 1;
  Reference counted_by;
};

struct Field {
  std::string name;
  std::string path;  // "points.level"
  std::string documentation;
  std::string unit;
  Kind kind = Kind::kUnsigned;
  uint8_t width = 1;  // bytes of a number, or of a word of bits
  bool big_endian = false;
  uint8_t first_bit = 0;  // of a member of a word
  uint8_t bit_count = 0;
  bool is_array = false;
  bool counts = false;      // the elements or bytes of a later field
  bool is_counted = false;  // by an earlier field: it, or one inside
  Extent count;
  Extent size;  // of texts, blocks and streams
  std::optional<Bits> least;
  std::optional<Bits> most;
  std::optional<Bits> preset;               // of a number
  std::optional<std::string> preset_bytes;  // of a text or block
  std::shared_ptr<const Enumeration> enumeration;
  std::optional<Condition> condition;
  std::vector<Bits> success;  // of the status field
  uint32_t slot = kNoSlot;
  uint32_t depth = 0;
  uint32_t capacity = 1;  // elements, through all arrays
  std::vector<Field> members;

  bool is_group() const { return kind >= Kind::kRecord; }
  bool is_number() const { return kind <= Kind::kReal; }
  bool is_status() const { return !success.empty(); }
};

struct Message {
  std::vector<Field> fields;
  std::vector<const Field*> slots;  // by number
  size_t shortest = 0;              // bytes
  bool is_open = false;             // a reply may be longer than its fields

  Message() = default;
  Message(Message&&) = default;  // the fields stay where they are
  Message& operator=(Message&&) = default;
  Message(const Message&) = delete;
  Message& operator=(const Message&) = delete;
};

enum class Frame : uint8_t { kFtm, kFtmLegacy, kDiagnostic, kSubsystem };
enum class ModeRule : uint8_t { kFixed, kCurrent, kByRfMode };

// How the commands of a family are sent.
struct Framing {
  Frame frame = Frame::kFtm;
  ModeRule mode_rule = ModeRule::kFixed;
  uint16_t mode_id = 0;
  ftm::HeaderForm header = ftm::HeaderForm::kPlain;
  uint8_t subsystem = 0;

  bool operator==(const Framing&) const = default;
};

struct Command {
  std::string name;  // "WLAN.TX_START"
  std::string documentation;
  Framing framing;
  uint16_t id = 0;
  Message request;
  Message reply;
};

using CommandPtr = std::shared_ptr<const Command>;

// --- Numbers of a field ---------------------------------------------------------------------------------------------

unsigned BitCount(const Field& field);
// What is read as a signed number of so many bits.
Bits SignExtended(Bits value, unsigned bits);
// Whether the field's type can hold it, and whether it may be sent.
bool FitsType(const Field& field, Bits value);
bool IsInRange(const Field& field, Bits value);
// What the field makes of it: of a real number the nearest that its width has. What is beyond its type stays.
Bits Rounded(const Field& field, Bits value);
// What it may be at least and at most; of a real one without limits its infinities.
std::pair<Bits, Bits> RangeOf(const Field& field);
// A word of the enumeration, a decimal number, or a hexadecimal one behind 0x; nothing for what the type cannot hold.
std::optional<Bits> ParseNumber(const Field& field, std::string_view text);
std::string NumberText(const Field& field, Bits value);
// "1 to 14 MHz", "-1.5 to 3 dB": what a field takes.
std::string RangeText(const Field& field);
// "u16", "s8", "f32", "text", ...
std::string TypeText(const Field& field);

// The definitions of one handset.
class Definitions {
 public:
  size_t count() const { return commands_.size(); }
  CommandPtr At(size_t index) const { return index < commands_.size() ? commands_[index] : nullptr; }
  CommandPtr Find(std::string_view name) const;
  // Of names that are not there yet.
  void Add(std::vector<CommandPtr> commands);
  void Clear();

 private:
  std::vector<CommandPtr> commands_;
  std::unordered_map<std::string_view, size_t> by_name_;
};

}  // namespace kral::defined

#endif

// Makes the bytes of a message from its values.
#include <algorithm>
#include <bit>
#include <map>
#include <utility>

#include "base/deflate.h"
#include "commands/defined/values.h"

namespace kral::defined {
namespace {

class Encoder {
 public:
  explicit Encoder(const Values& values) : values_(values) {}

  std::vector<uint8_t> Run() {
    std::vector<uint8_t> bytes = Make();
    if (used_ != values_.set_count()) NameUnused();
    return bytes;
  }

 private:
  enum class Sized : uint8_t { kOthers, kStreams };

  // What a stream takes is known when all that is in it is: numbers that count elements as well.
  std::vector<uint8_t> Make() {
    const auto& fields = values_.message().fields;
    DeriveCounts(fields, 0, Sized::kOthers);
    DeriveCounts(fields, 0, Sized::kStreams);
    std::vector<uint8_t> bytes;
    Group(fields, 0, bytes);
    return bytes;
  }

  // --- Numbers ------------------------------------------------------------------------------------------------------

  // The value of a number: set, following from what it counts, or by default.
  const Bits* Find(uint32_t slot, uint32_t element) const {
    if (const Bits* const value = values_.Number(slot, element)) return value;
    if (const auto derived = derived_.find({slot, element}); derived != derived_.end()) return &derived->second;
    const Field& field = *values_.message().slots[slot];
    return field.preset ? &*field.preset : nullptr;
  }

  Bits Number(const Field& field, uint32_t element) {
    if (values_.Number(field.slot, element) != nullptr) Use(field, element);
    const Bits* const value = Find(field.slot, element);
    if (value == nullptr) throw BadCall(field.path + " is missing: " + RangeText(field));
    return *value;
  }

  bool Holds(const Condition& condition) const {
    const Bits* const value = Find(condition.on.slot, elements_[condition.on.depth]);
    if (value == nullptr) return false;  // and missing, which its own place says
    const bool listed = std::ranges::find(condition.values, *value) != condition.values.end();
    return listed != condition.is_not;
  }

  // --- What a count or size counts ----------------------------------------------------------------------------------

  // Counts need not be given where what they count is. It stands behind them, in the same group or in one inside.
  void DeriveCounts(const std::vector<Field>& fields, uint32_t depth, Sized what) {
    for (const Field& field : fields) {
      if (!field.is_counted || (field.condition && !Holds(*field.condition))) continue;
      const uint32_t first = elements_[depth] * field.count.most;
      const uint32_t elements = CountElements(field, first, what);
      for (uint32_t i = 0; field.is_group() && i < elements; ++i) {
        elements_[depth + 1] = first + i;
        DeriveCounts(field.members, depth + 1, what);
      }
      const bool in_turn = (field.kind == Kind::kPacked) == (what == Sized::kStreams);
      if (!IsSized(field) || field.size.rule != Extent::Rule::kCounted || !in_turn) continue;
      for (uint32_t i = 0; i < elements; ++i) {
        Derive(field, field.size.counted_by, SizeOf(field, first + i), " bytes: ");
      }
    }
  }

  // The elements to look into, and what counts them.
  uint32_t CountElements(const Field& field, uint32_t first, Sized what) {
    if (field.count.rule == Extent::Rule::kFixed) return field.count.most;
    const uint32_t reach = Reach(values_, field, first, field.count.most);
    if (field.count.rule != Extent::Rule::kCounted) return reach;
    const Reference& reference = field.count.counted_by;
    if (what == Sized::kOthers) Derive(field, reference, reach, " elements: ");
    const Bits* const count = Find(reference.slot, elements_[reference.depth]);
    return count != nullptr ? static_cast<uint32_t>(std::min<Bits>(*count, field.count.most)) : reach;
  }

  // What counts several things is what the most of them have: those that have less are then refused.
  void Derive(const Field& field, const Reference& reference, uint32_t count, const char* of_what) {
    const uint32_t element = elements_[reference.depth];
    const Field& counter = *values_.message().slots[reference.slot];
    if (values_.Number(reference.slot, element) != nullptr || (count == 0 && counter.preset)) return;
    if (!IsInRange(counter, count)) {
      throw BadCall(field.path + " has " + std::to_string(count) + of_what + counter.path + " takes " +
                    RangeText(counter));
    }
    Bits& derived = derived_[{reference.slot, element}];
    derived = std::max<Bits>(derived, count);
  }

  std::string CountText(const Reference& reference, Bits count) const {
    return reference.name + "=" + NumberText(*values_.message().slots[reference.slot], count);
  }

  static bool IsSized(const Field& field) {
    return field.kind == Kind::kText || field.kind == Kind::kBytes || field.kind == Kind::kPacked;
  }

  uint32_t SizeOf(const Field& field, uint32_t element) {
    if (field.kind == Kind::kPacked) {
      const uint32_t used = used_;  // the group is made twice, and counts once
      const auto size = static_cast<uint32_t>(Packed(field, element).size());
      used_ = used;
      return size;
    }
    const std::string* const bytes = values_.Bytes(field.slot, element);
    return static_cast<uint32_t>(bytes != nullptr ? bytes->size() : field.preset_bytes.value_or("").size());
  }

  // --- Fields -------------------------------------------------------------------------------------------------------

  void Group(const std::vector<Field>& fields, uint32_t depth, std::vector<uint8_t>& bytes) {
    for (const Field& field : fields) {
      if (field.condition && !Holds(*field.condition)) continue;
      const uint32_t first = elements_[depth] * field.count.most;
      const uint32_t count = CountOf(field, first);
      for (uint32_t i = 0; i < count; ++i) One(field, first + i, bytes);
    }
  }

  uint32_t CountOf(const Field& field, uint32_t first) const {
    switch (field.count.rule) {
      case Extent::Rule::kCounted: {
        const Reference& reference = field.count.counted_by;
        const Bits* const count = Find(reference.slot, elements_[reference.depth]);
        if (count == nullptr) throw BadCall(reference.name + " is missing: it counts " + field.path);
        if (*count > field.count.most) {
          throw BadCall(CountText(reference, *count) + " is out of range: " + field.path + " has at most " +
                        std::to_string(field.count.most) + " elements");
        }
        return static_cast<uint32_t>(*count);
      }
      case Extent::Rule::kToEnd:
        return Reach(values_, field, first, field.count.most);
      default:
        return field.count.most;
    }
  }

  void One(const Field& field, uint32_t element, std::vector<uint8_t>& bytes) {
    switch (field.kind) {
      case Kind::kRecord:
        elements_[field.depth + 1] = element;
        return Group(field.members, field.depth + 1, bytes);
      case Kind::kBits:
        return Store(field, Word(field, element), bytes);
      case Kind::kPacked:
        return Append(field, Packed(field, element), bytes);
      case Kind::kText:
      case Kind::kBytes:
        return Block(field, element, bytes);
      default:
        return Store(field, Number(field, element), bytes);
    }
  }

  // Bits that no member has are 0.
  Bits Word(const Field& field, uint32_t element) {
    Bits word = 0;
    for (const Field& member : field.members) {
      const Bits mask = member.bit_count == 64 ? UINT64_MAX : (Bits{1} << member.bit_count) - 1;
      word |= (Number(member, element) & mask) << member.first_bit;
    }
    return word;
  }

  std::vector<uint8_t> Packed(const Field& field, uint32_t element) {
    elements_[field.depth + 1] = element;
    std::vector<uint8_t> plain;
    Group(field.members, field.depth + 1, plain);
    if (plain.size() > kLongestMessage) throw BadCall(field.path + " holds more than 64 KiB");
    return Compress(plain);
  }

  void Block(const Field& field, uint32_t element, std::vector<uint8_t>& bytes) {
    const std::string* text = values_.Bytes(field.slot, element);
    if (text != nullptr) Use(field, element);
    if (text == nullptr && field.preset_bytes) text = &*field.preset_bytes;
    if (text == nullptr) {
      throw BadCall(field.path + " is missing: " + TypeText(field) + " of at most " + std::to_string(field.size.most) +
                    " bytes");
    }
    const size_t begin = bytes.size();
    Append(field, {reinterpret_cast<const uint8_t*>(text->data()), text->size()}, bytes);
    if (field.size.rule == Extent::Rule::kFixed) bytes.resize(begin + field.size.most);
    if (field.size.rule == Extent::Rule::kTerminated) bytes.push_back(0);
  }

  void Append(const Field& field, std::span<const uint8_t> block, std::vector<uint8_t>& bytes) const {
    if (field.size.rule == Extent::Rule::kCounted) {
      const Reference& reference = field.size.counted_by;
      const Bits* const size = Find(reference.slot, elements_[reference.depth]);
      if (size == nullptr || *size != block.size()) {
        throw BadCall((size == nullptr ? reference.name + " is missing" : CountText(reference, *size)) + ": " +
                      field.path + " has " + std::to_string(block.size()) + " bytes");
      }
    }
    bytes.insert(bytes.end(), block.begin(), block.end());
  }

  static void Store(const Field& field, Bits value, std::vector<uint8_t>& bytes) {
    if (field.kind == Kind::kReal && field.width == 4) {
      value = std::bit_cast<uint32_t>(static_cast<float>(std::bit_cast<double>(value)));
    }
    for (unsigned i = 0; i < field.width; ++i) {
      const unsigned place = field.big_endian ? field.width - 1U - i : i;
      bytes.push_back(static_cast<uint8_t>(value >> (8 * place)));
    }
  }

  // --- Values without a place ---------------------------------------------------------------------------------------

  void Use(const Field& field, uint32_t element) {
    ++used_;
    if (naming_) places_.emplace_back(field.slot, element);
  }

  // For the message only: the usual call does not keep which values it used.
  [[noreturn]] void NameUnused() {
    Encoder again(values_);
    again.naming_ = true;
    again.Make();
    for (const Field* const field : values_.message().slots) {
      const uint32_t end = values_.Reach(field->slot, 0, field->capacity);
      for (uint32_t element = 0; element < end; ++element) {
        if (values_.Reach(field->slot, element, element + 1) == 0) continue;
        if (std::ranges::find(again.places_, std::pair(field->slot, element)) != again.places_.end()) continue;
        throw BadCall(field->path + (field->capacity > 1 ? " (element " + std::to_string(element) + ")" : "") +
                      " has no place in this request: see what counts it, and when it is there");
      }
    }
    throw BadCall("a value has no place in this request");
  }

  const Values& values_;
  Elements elements_{};
  std::map<std::pair<uint32_t, uint32_t>, Bits> derived_;  // by slot and element
  uint32_t used_ = 0;
  bool naming_ = false;
  std::vector<std::pair<uint32_t, uint32_t>> places_;
};

}  // namespace

std::vector<uint8_t> Encode(const Values& values) {
  return Encoder(values).Run();
}

}  // namespace kral::defined

// Takes the values of a message out of its bytes. Nothing is read beyond their end, whatever counts and sizes say.
#include <algorithm>
#include <bit>

#include "base/deflate.h"
#include "commands/defined/values.h"

namespace kral::defined {
namespace {

constexpr size_t kMostUnpacked = size_t{1} << 20;  // streams within streams multiply

class Decoder {
 public:
  Decoder(Values& values, bool padded) : values_(values), padded_(padded || values.message().is_open) {}

  void Run(std::span<const uint8_t> bytes) {
    rest_ = bytes;
    Group(values_.message().fields, 0);
    if (!rest_.empty() && !padded_) {
      throw BadCall("it is longer than defined: " + std::to_string(rest_.size()) + " of its " +
                    std::to_string(bytes.size()) + " bytes are left over");
    }
  }

 private:
  std::span<const uint8_t> Take(const Field& field, size_t size) {
    if (size > rest_.size()) {
      throw BadCall("it is too short: " + field.path + " takes " + std::to_string(size) + " bytes, and there are " +
                    std::to_string(rest_.size()));
    }
    const auto taken = rest_.first(size);
    rest_ = rest_.subspan(size);
    return taken;
  }

  void Group(const std::vector<Field>& fields, uint32_t depth) {
    for (const Field& field : fields) {
      if (field.condition && !IsThere(*field.condition, values_, elements_)) continue;
      const uint32_t first = elements_[depth] * field.count.most;
      if (field.count.rule == Extent::Rule::kToEnd) {
        for (uint32_t i = 0; !rest_.empty(); ++i) {
          if (i == field.count.most) throw BadCall(field.path + " has more than " + std::to_string(i) + " elements");
          const size_t before = rest_.size();
          One(field, first + i);
          if (rest_.size() == before) throw BadCall(field.path + " has an element without bytes");
        }
      } else {
        const uint32_t count = Counted(field, field.count, "elements");
        for (uint32_t i = 0; i < count; ++i) One(field, first + i);
      }
    }
  }

  uint32_t Counted(const Field& field, const Extent& extent, const char* what) const {
    if (extent.rule != Extent::Rule::kCounted) return extent.most;
    const Bits* const count = values_.Number(extent.counted_by.slot, elements_[extent.counted_by.depth]);
    if (count == nullptr || *count > extent.most) {
      const Field& counter = *values_.message().slots[extent.counted_by.slot];
      throw BadCall(extent.counted_by.name + "=" + (count == nullptr ? "?" : NumberText(counter, *count)) + ": " +
                    field.path + " has at most " + std::to_string(extent.most) + " " + what);
    }
    return static_cast<uint32_t>(*count);
  }

  void One(const Field& field, uint32_t element) {
    switch (field.kind) {
      case Kind::kRecord:
        elements_[field.depth + 1] = element;
        return Group(field.members, field.depth + 1);
      case Kind::kBits:
        return Word(field, element);
      case Kind::kPacked:
        return Packed(field, element);
      case Kind::kText:
      case Kind::kBytes:
        return Block(field, element);
      default:
        return Number(field, element, Load(field));
    }
  }

  Bits Load(const Field& field) {
    const auto bytes = Take(field, field.width);
    Bits value = 0;
    for (unsigned i = 0; i < field.width; ++i) {
      value = value << 8 | bytes[field.big_endian ? i : field.width - 1U - i];
    }
    return value;
  }

  void Number(const Field& field, uint32_t element, Bits value) {
    if (field.kind == Kind::kSigned) value = SignExtended(value, BitCount(field));
    if (field.kind == Kind::kReal && field.width == 4) {
      value = std::bit_cast<Bits>(static_cast<double>(std::bit_cast<float>(static_cast<uint32_t>(value))));
    }
    values_.SetNumber(field.slot, element, value);
    if (!field.is_status() || std::ranges::find(field.success, value) != field.success.end()) return;
    std::string text = field.path + " is " + NumberText(field, value);
    if (const std::string* const word = field.enumeration ? field.enumeration->NameOf(value) : nullptr) {
      text += " (" + *word + ")";
    }
    throw RefusedByStatus(text, value);
  }

  void Word(const Field& field, uint32_t element) {
    const Bits word = Load(field);
    for (const Field& member : field.members) {
      const Bits mask = member.bit_count == 64 ? UINT64_MAX : (Bits{1} << member.bit_count) - 1;
      Number(member, element, word >> member.first_bit & mask);
    }
  }

  size_t SizeOf(const Field& field) const {
    if (field.size.rule == Extent::Rule::kToEnd) {
      if (rest_.size() > field.size.most) {
        throw BadCall(field.path + " has more than " + std::to_string(field.size.most) + " bytes");
      }
      return rest_.size();
    }
    if (field.size.rule != Extent::Rule::kTerminated) return Counted(field, field.size, "bytes");
    const auto end = std::ranges::find(rest_, uint8_t{0});
    if (end == rest_.end()) throw BadCall(field.path + " is not terminated");
    const auto size = static_cast<size_t>(end - rest_.begin());
    if (size > field.size.most)
      throw BadCall(field.path + " takes at most " + std::to_string(field.size.most) + " bytes");
    return size;
  }

  void Block(const Field& field, uint32_t element) {
    const auto bytes = Take(field, SizeOf(field));
    std::string text(bytes.begin(), bytes.end());
    if (field.size.rule == Extent::Rule::kTerminated) Take(field, 1);
    if (field.kind == Kind::kText && field.size.rule == Extent::Rule::kFixed)
      text.resize(std::min(text.find('\0'), text.size()));
    values_.SetBytes(field.slot, element, std::move(text));
  }

  void Packed(const Field& field, uint32_t element) {
    const auto bytes = Take(field, SizeOf(field));
    size_t used = 0;
    const auto plain = Decompress(bytes, kLongestMessage, &used);
    if (!plain) throw BadCall(field.path + " is no whole zlib stream, or holds more than 64 KiB");
    if (used != bytes.size()) throw BadCall(field.path + " is longer than its stream");
    unpacked_ += plain->size();
    if (unpacked_ > kMostUnpacked) throw BadCall("its zlib streams hold more than 1 MiB");
    const auto outer = rest_;
    rest_ = *plain;
    elements_[field.depth + 1] = element;
    Group(field.members, field.depth + 1);
    if (!rest_.empty())
      throw BadCall(field.path + " holds " + std::to_string(rest_.size()) + " bytes more than defined");
    rest_ = outer;
  }

  Values& values_;
  const bool padded_;
  Elements elements_{};
  std::span<const uint8_t> rest_;
  size_t unpacked_ = 0;
};

}  // namespace

void Decode(std::span<const uint8_t> bytes, Values& values, bool padded) {
  values.Clear();
  try {
    Decoder(values, padded).Run(bytes);
  } catch (...) {
    values.Clear();  // what came before the fault is no reply
    throw;
  }
}

}  // namespace kral::defined

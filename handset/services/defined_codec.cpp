// Takes requests apart and puts replies together; what is remembered in between is defined_service.cpp's.
#include "handset/services/defined_codec.h"

#include <zlib.h>

#include <algorithm>
#include <array>
#include <bit>
#include <charconv>
#include <cstdlib>
#include <stdexcept>

namespace kral::handset {
namespace {

constexpr uLongf kLongestStream = 64 << 10;

// A request that is too long or too short, or not what it may be.
struct Refused {
  Refusal refusal;
};

bool IsNumber(const DefinedField& field) {
  return field.bits != 0;
}

// A field of that name beside the one at `prefix`, or beside a group around it.
const std::string* Find(const DefinedValues& values, std::string prefix, const std::string& name) {
  for (;;) {
    if (const auto found = values.find(prefix + name); found != values.end()) return &found->second;
    if (prefix.empty()) return nullptr;
    prefix.pop_back();
    prefix.erase(prefix.find_last_of('.') + 1);
  }
}

// "kind=1,2", "kind!=0"
bool IsThere(const DefinedField& field, const DefinedValues& values, const std::string& prefix) {
  if (field.when.empty()) return true;
  const size_t equals = field.when.find('=');
  const bool is_not = field.when[equals - 1] == '!';
  const std::string* const value = Find(values, prefix, field.when.substr(0, equals - (is_not ? 1 : 0)));
  const std::string listed = "," + field.when.substr(equals + 1) + ",";
  return value != nullptr && (listed.find("," + *value + ",") != std::string::npos) != is_not;
}

std::string TextOf(const DefinedField& field, uint64_t bits) {
  if (field.type[0] == 'f') {
    const double value = field.width == 4 ? static_cast<double>(std::bit_cast<float>(static_cast<uint32_t>(bits)))
                                          : std::bit_cast<double>(bits);
    std::array<char, 40> text;
    return {text.data(), std::to_chars(text.data(), text.data() + text.size(), value).ptr};
  }
  if (field.type[0] != 's') return std::to_string(bits);
  const unsigned unused = 64 - field.bits;
  return std::to_string(static_cast<int64_t>(bits << unused) >> unused);
}

uint64_t BitsOf(const DefinedField& field, const std::string& text) {
  if (field.type[0] == 'f') {
    const double value = std::strtod(text.c_str(), nullptr);
    return field.width == 4 ? std::bit_cast<uint32_t>(static_cast<float>(value)) : std::bit_cast<uint64_t>(value);
  }
  const uint64_t magnitude = std::strtoull(text.c_str() + (text.starts_with('-') ? 1 : 0), nullptr, 0);
  return text.starts_with('-') ? uint64_t{0} - magnitude : magnitude;
}

// --- Requests
// ---------------------------------------------------------------------------------------------------------

class Taker {
 public:
  explicit Taker(ByteView bytes) : rest_(bytes) {}

  DefinedValues Run(const std::vector<DefinedField>& fields) {
    Group(fields, "");
    if (!rest_.empty()) throw Refused{Refusal::kBadLength};
    return std::move(values_);
  }

 private:
  ByteView Take(size_t size) {
    if (size > rest_.size()) throw Refused{Refusal::kBadLength};
    const ByteView taken = rest_.first(size);
    rest_ = rest_.subspan(size);
    return taken;
  }

  static void Limit(size_t size, const std::optional<size_t>& most) {
    if (most && size > *most) throw Refused{Refusal::kBadParameter};
  }

  size_t NumberOf(const std::string& text, const std::string& prefix) const {
    if (text[0] >= '0' && text[0] <= '9') return std::strtoul(text.c_str(), nullptr, 10);
    const std::string* const value = Find(values_, prefix, text);
    return value != nullptr ? std::strtoul(value->c_str(), nullptr, 10) : 0;
  }

  void Group(const std::vector<DefinedField>& fields, const std::string& prefix) {
    for (const DefinedField& field : fields) {
      if (!IsThere(field, values_, prefix)) continue;
      if (field.count.empty()) {
        One(field, prefix + field.name, prefix);
        continue;
      }
      const size_t count = field.count == "*" ? SIZE_MAX : NumberOf(field.count, prefix);
      for (size_t i = 0; i < count && !(field.count == "*" && rest_.empty()); ++i) {
        Limit(i + 1, field.most_elements);
        const size_t before = rest_.size();
        One(field, prefix + field.name + "[" + std::to_string(i) + "]", prefix);
        if (rest_.size() == before) throw Refused{Refusal::kBadLength};  // or it would never end
      }
    }
  }

  void One(const DefinedField& field, const std::string& path, const std::string& prefix) {
    if (field.type == "bits") {
      const uint64_t word = Load(field);
      for (const DefinedField& part : field.fields) {
        const uint64_t mask = part.bits == 64 ? UINT64_MAX : (uint64_t{1} << part.bits) - 1;
        Number(part, path + "." + part.name, word >> part.first_bit & mask);
      }
    } else if (field.type == "record") {
      Group(field.fields, path + ".");
    } else if (IsNumber(field)) {
      Number(field, path, Load(field));
    } else {
      Block(field, path, prefix);
    }
  }

  uint64_t Load(const DefinedField& field) {
    const ByteView bytes = Take(field.width);
    uint64_t bits = 0;
    for (size_t i = 0; i < bytes.size(); ++i) bits = bits << 8 | bytes[field.big ? i : bytes.size() - 1 - i];
    return bits;
  }

  void Number(const DefinedField& field, const std::string& path, uint64_t bits) {
    const std::string text = TextOf(field, bits);
    const double value = std::strtod(text.c_str(), nullptr);
    if ((field.least && value < *field.least) || (field.most && value > *field.most)) {
      throw Refused{Refusal::kBadParameter};
    }
    values_[path] = text;
  }

  void Block(const DefinedField& field, const std::string& path, const std::string& prefix) {
    if (field.size == "terminated") {
      const auto end = std::ranges::find(rest_, uint8_t{0});
      const ByteView text = Take(static_cast<size_t>(end - rest_.begin()));
      Limit(text.size(), field.most_bytes);
      Take(1);
      values_[path].assign(text.begin(), text.end());
      return;
    }
    const ByteView bytes = Take(field.size == "*" ? rest_.size() : NumberOf(field.size, prefix));
    Limit(bytes.size(), field.most_bytes);
    if (field.type == "zlib") return Unpack(field, path, bytes);
    std::string text(bytes.begin(), bytes.end());
    if (field.type == "text") text.resize(std::min(text.find('\0'), text.size()));
    values_[path] = text;
  }

  void Unpack(const DefinedField& field, const std::string& path, ByteView stream) {
    Bytes plain(kLongestStream);
    uLongf size = kLongestStream;
    if (uncompress(plain.data(), &size, stream.data(), static_cast<uLong>(stream.size())) != Z_OK) {
      throw Refused{Refusal::kBadParameter};
    }
    const ByteView outer = rest_;
    rest_ = ByteView(plain).first(size);
    Group(field.fields, path + ".");
    if (!rest_.empty()) throw Refused{Refusal::kBadParameter};
    rest_ = outer;
  }

  ByteView rest_;
  DefinedValues values_;
};

// --- Replies
// ----------------------------------------------------------------------------------------------------------

class Maker {
 public:
  explicit Maker(const DefinedValues& values) : values_(values) {}

  Bytes Run(const std::vector<DefinedField>& fields) {
    Bytes bytes;
    Group(fields, "", bytes);
    return bytes;
  }

 private:
  void Group(const std::vector<DefinedField>& fields, const std::string& prefix, Bytes& bytes) {
    for (const DefinedField& field : fields) Count(fields, field, prefix);
    for (const DefinedField& field : fields) {
      if (!IsThere(field, values_, prefix)) continue;
      if (field.count.empty()) {
        One(field, prefix + field.name, bytes);
        continue;
      }
      const size_t count = CountOf(field, prefix);
      for (size_t i = 0; i < count; ++i) One(field, prefix + field.name + "[" + std::to_string(i) + "]", bytes);
    }
  }

  // Before a group is made: what counts, and what conditions look at, must have a value.
  void Count(const std::vector<DefinedField>& fields, const DefinedField& field, const std::string& prefix) {
    if (!IsNumber(field) || !field.count.empty()) return;
    if (field.type == "bits") {
      for (const DefinedField& part : field.fields) CountAs(fields, part, field.name + "." + part.name, prefix);
    } else {
      CountAs(fields, field, field.name, prefix);
    }
  }

  void CountAs(const std::vector<DefinedField>& fields, const DefinedField& field, const std::string& name,
               const std::string& prefix) {
    const auto counted = Counted(fields, name, prefix);
    values_[prefix + name] = counted ? std::to_string(*counted) : Preset(field, prefix + name);
  }

  // Of what that name counts, in this group and in those inside it: elements, or bytes. One inside that has a field of
  // the name means its own.
  std::optional<size_t> Counted(const std::vector<DefinedField>& fields, const std::string& name,
                                const std::string& prefix) {
    for (const DefinedField& other : fields) {
      const std::string path = prefix + other.name + (other.count.empty() ? "" : "[0]");
      if (other.count == name) return Remembered(other, prefix);
      if (other.size == name) {
        Bytes block;
        Block(other, path, block);
        return block.size();
      }
      if (other.type != "record" && other.type != "zlib") continue;
      const bool has_its_own =
          std::ranges::find(other.fields, name.substr(0, name.find('.')), &DefinedField::name) != other.fields.end();
      if (has_its_own) continue;
      if (const auto inside = Counted(other.fields, name, path + ".")) return inside;
    }
    return std::nullopt;
  }

  // Elements that there are values of.
  size_t Remembered(const DefinedField& field, const std::string& prefix) const {
    size_t count = 0;
    for (;; ++count) {
      const std::string path = prefix + field.name + "[" + std::to_string(count) + "]";
      const auto next = values_.lower_bound(path);
      if (next == values_.end() || !next->first.starts_with(path)) return count;
    }
  }

  size_t CountOf(const DefinedField& field, const std::string& prefix) const {
    if (field.count[0] >= '0' && field.count[0] <= '9') return std::strtoul(field.count.c_str(), nullptr, 10);
    if (field.count == "*") return Remembered(field, prefix);
    const std::string* const value = Find(values_, prefix, field.count);
    return value != nullptr ? std::strtoul(value->c_str(), nullptr, 10) : 0;
  }

  // The value, or what stands for none: the default, success, what is nearest to 0.
  std::string Preset(const DefinedField& field, const std::string& path) const {
    if (const auto found = values_.find(path); found != values_.end()) return found->second;
    if (!field.preset.empty()) return field.preset;
    if (!field.success.empty()) return field.success.substr(0, field.success.find(','));
    if (field.least && *field.least > 0) return std::to_string(static_cast<long long>(*field.least));
    return "0";
  }

  void One(const DefinedField& field, const std::string& path, Bytes& bytes) {
    if (field.type == "bits") {
      uint64_t word = 0;
      for (const DefinedField& part : field.fields) {
        const uint64_t mask = part.bits == 64 ? UINT64_MAX : (uint64_t{1} << part.bits) - 1;
        word |= (BitsOf(part, Preset(part, path + "." + part.name)) & mask) << part.first_bit;
      }
      Store(field, word, bytes);
    } else if (field.type == "record") {
      Group(field.fields, path + ".", bytes);
    } else if (IsNumber(field)) {
      Store(field, BitsOf(field, Preset(field, path)), bytes);
    } else {
      Block(field, path, bytes);
    }
  }

  static void Store(const DefinedField& field, uint64_t bits, Bytes& bytes) {
    for (size_t i = 0; i < field.width; ++i) {
      bytes.push_back(static_cast<uint8_t>(bits >> 8 * (field.big ? field.width - 1 - i : i)));
    }
  }

  void Block(const DefinedField& field, const std::string& path, Bytes& bytes) {
    if (field.type == "zlib") {
      Bytes plain;
      Group(field.fields, path + ".", plain);
      uLongf size = compressBound(static_cast<uLong>(plain.size()));
      Bytes stream(size);
      compress(stream.data(), &size, plain.data(), static_cast<uLong>(plain.size()));
      bytes.insert(bytes.end(), stream.begin(), stream.begin() + static_cast<std::ptrdiff_t>(size));
      return;
    }
    const auto found = values_.find(path);
    std::string text = found != values_.end() ? found->second : field.preset;
    if (field.size[0] >= '0' && field.size[0] <= '9') text.resize(std::strtoul(field.size.c_str(), nullptr, 10));
    bytes.insert(bytes.end(), text.begin(), text.end());
    if (field.size == "terminated") bytes.push_back(0);
  }

  DefinedValues values_;
};

}  // namespace

std::optional<DefinedValues> TakeDefined(const std::vector<DefinedField>& fields, ByteView bytes, Refusal& refusal) {
  try {
    return Taker(bytes).Run(fields);
  } catch (const Refused& refused) {
    refusal = refused.refusal;
    return std::nullopt;
  }
}

Bytes MakeDefined(const std::vector<DefinedField>& fields, const DefinedValues& values) {
  return Maker(values).Run(fields);
}

}  // namespace kral::handset

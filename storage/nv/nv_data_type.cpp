// Turns values into decimal numbers and back, checked against member type and range.
#include "storage/nv/nv_data_type.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <limits>

namespace kral::nv {
namespace {

uint64_t LoadWord(std::span<const uint8_t> bytes) {
  uint64_t value = 0;
  for (size_t i = bytes.size(); i-- > 0;) value = value << 8 | bytes[i];
  return value;
}

void AppendNumber(std::string& text, std::span<const uint8_t> word, bool is_signed) {
  uint64_t value = LoadWord(word);
  std::array<char, 24> digits;
  std::to_chars_result end{};
  if (is_signed) {
    const auto unused = static_cast<unsigned>(64 - 8 * word.size());
    const auto number = static_cast<int64_t>(value << unused) >> unused;
    end = std::to_chars(digits.data(), digits.data() + digits.size(), number);
  } else {
    end = std::to_chars(digits.data(), digits.data() + digits.size(), value);
  }
  text.append(digits.data(), end.ptr);
}

// The word that a decimal number stands for; nothing when it is none or beyond the member's range.
std::optional<uint64_t> ParseNumber(std::string_view text, const NvMember& member) {
  const unsigned bits = 8u * member.width;
  const char* const end = text.data() + text.size();
  if (member.is_signed) {
    int64_t value = 0;
    const auto result = std::from_chars(text.data(), end, value);
    const int64_t highest = std::numeric_limits<int64_t>::max() >> (64 - bits);
    if (result.ec != std::errc() || result.ptr != end || value > highest || value < -highest - 1) return std::nullopt;
    return static_cast<uint64_t>(value);
  }
  uint64_t value = 0;
  const auto result = std::from_chars(text.data(), end, value);
  if (result.ec != std::errc() || result.ptr != end || value > std::numeric_limits<uint64_t>::max() >> (64 - bits)) {
    return std::nullopt;
  }
  return value;
}

// The numbers of a text one by one.
class Numbers {
 public:
  explicit Numbers(std::string_view text) : rest_(text) { SkipBlanks(); }

  bool at_end() const { return rest_.empty(); }
  std::string_view Next() {
    const std::string_view word = rest_.substr(0, rest_.find_first_of(kSeparators));
    rest_.remove_prefix(word.size());
    SkipBlanks();
    if (rest_.starts_with(',')) {
      rest_.remove_prefix(1);
      SkipBlanks();
      if (rest_.empty()) rest_ = ",";  // a comma promises another number
    }
    return word;
  }

 private:
  static constexpr std::string_view kBlanks = " \t\r\n";
  static constexpr std::string_view kSeparators = ", \t\r\n";

  void SkipBlanks() { rest_.remove_prefix(std::min(rest_.find_first_not_of(kBlanks), rest_.size())); }

  std::string_view rest_;
};

}  // namespace

size_t NvForm::size() const {
  size_t size = 0;
  for (const NvMember& member : members) size += member.size();
  return size;
}

NvDataType NvDataType::Generic(size_t size) {
  // Of an empty file: a member of no element is none, but the only one may be absent.
  if (size == 0) return NvDataType("", {{std::nullopt, {{"data", 1, false, 1}}}}, true);
  return NvDataType("", {{std::nullopt, {{"data", 1, false, static_cast<uint32_t>(size)}}}}, false);
}

size_t NvDataType::longest() const {
  size_t longest = 0;
  for (const NvForm& form : forms_) longest = std::max(longest, form.size());
  return longest;
}

const NvForm* NvDataType::FormOf(uint64_t first) const {
  const NvForm* other = nullptr;
  for (const NvForm& form : forms_) {
    if (form.selector == first) return &form;
    if (!form.selector) other = &form;
  }
  return other;
}

const NvForm* NvDataType::FormOf(std::span<const uint8_t> bytes) const {
  if (forms_.size() == 1 && !forms_[0].selector) return &forms_[0];
  const size_t width = forms_.empty() ? 0 : forms_[0].members[0].width;
  if (forms_.empty() || bytes.size() < width) return nullptr;
  return FormOf(LoadWord(bytes.first(width)));
}

bool NvDataType::FitsForm(const NvForm& form, size_t size) const {
  const size_t whole = form.size();
  if (!variable_size_) return size == whole;
  const NvMember& last = form.members.back();
  return size <= whole && size >= whole - last.size() && (whole - size) % last.width == 0;
}

bool NvDataType::Holds(std::span<const uint8_t> value) const {
  const NvForm* form = FormOf(value);
  return form != nullptr && FitsForm(*form, value.size());
}

std::optional<std::vector<uint8_t>> NvDataType::Cut(std::span<const uint8_t> bytes) const {
  const NvForm* form = FormOf(bytes);
  if (form == nullptr) return std::nullopt;
  const size_t size = std::min(bytes.size(), form->size());
  if (!FitsForm(*form, size)) return std::nullopt;
  return std::vector<uint8_t>(bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(size));
}

std::vector<std::pair<std::string, std::string>> NvDataType::ToMembers(std::span<const uint8_t> value) const {
  std::vector<std::pair<std::string, std::string>> members;
  const NvForm* form = FormOf(value);
  if (form == nullptr) return members;
  for (const NvMember& member : form->members) {
    std::string numbers;
    for (uint32_t i = 0; i < member.count && value.size() >= member.width; ++i) {
      if (i > 0) numbers += ',';
      AppendNumber(numbers, value.first(member.width), member.is_signed);
      value = value.subspan(member.width);
    }
    members.emplace_back(member.name, std::move(numbers));
  }
  return members;
}

std::string NvDataType::ToText(std::span<const uint8_t> value) const {
  std::string text;
  for (const auto& [name, numbers] : ToMembers(value)) {
    if (!text.empty() && !numbers.empty()) text += ',';
    text += numbers;
  }
  return text;
}

std::optional<std::vector<uint8_t>> NvDataType::FromText(std::string_view text, std::string& problem) const {
  Numbers numbers(text);
  const NvForm* form = forms_.size() == 1 && !forms_[0].selector ? &forms_[0] : nullptr;
  if (form == nullptr && !forms_.empty() && !numbers.at_end()) {
    const NvMember& selector = forms_[0].members[0];
    const auto first = ParseNumber(Numbers(text).Next(), selector);
    // As it is kept: of a negative number only its own bytes.
    if (first) form = FormOf(*first & std::numeric_limits<uint64_t>::max() >> (64 - 8 * selector.width));
  }
  if (form == nullptr) {
    problem = "the first number chooses no form of the type";
    return std::nullopt;
  }
  std::vector<uint8_t> value;
  for (const NvMember& member : form->members) {
    const bool may_be_short = variable_size_ && &member == &form->members.back();
    for (uint32_t i = 0; i < member.count && !(may_be_short && numbers.at_end()); ++i) {
      const std::string_view word = numbers.Next();
      const auto number = ParseNumber(word, member);
      if (!number) {
        problem = word.empty() ? "too few numbers: none for " + member.name
                               : std::string(word) + " is out of the range of " + member.name;
        return std::nullopt;
      }
      for (uint8_t byte = 0; byte < member.width; ++byte) value.push_back(static_cast<uint8_t>(*number >> 8 * byte));
    }
  }
  if (!numbers.at_end()) {
    problem = "too many numbers";
    return std::nullopt;
  }
  return value;
}

}  // namespace kral::nv

// Keeps names apart, and knows those that have a meaning already.
#include "tools/kral/cmd/c_names.h"

#include <algorithm>
#include <cctype>

#include "tools/kral/format.h"

namespace kral::tool {
namespace {

// Words of C and C++, what is in the functions of the header, and what headers and compilers make macros of. A blank
// stands in front of each and behind it.
constexpr std::string_view kReserved =
    " CONST DELETE DOMAIN EOF ERROR FALSE FAR IN NAN NEAR NULL OPTIONAL OUT OVERFLOW PTRDIFF_MAX PTRDIFF_MIN "
    "SIG_ATOMIC_MAX SIG_ATOMIC_MIN SIZE_MAX STRICT TRUE VOID WCHAR_MAX WCHAR_MIN WIN32 WINNT WINT_MAX WINT_MIN "
    "alignas alignof and and_eq asm auto bitand bitor bool break call case catch char char16_t char32_t char8_t "
    "class co_await co_return co_yield compl concept const const_cast consteval constexpr constinit continue count "
    "decltype default delete do done double dynamic_cast else enum errno explicit export extern false far float for "
    "friend goto handle i i386 if inline int interface linux long memset mutable namespace near new noexcept not "
    "not_eq nullptr operator or or_eq private protected public register reinterpret_cast reply requires restrict "
    "return short signed size_t sizeof small static static_assert static_cast stderr stdin stdout strlen struct "
    "switch template this thread_local throw true try typedef typeid typename typeof typeof_unqual union unix "
    "unsigned using virtual void volatile wchar_t while xor xor_eq ";

// "uint8_t", "INT_FAST16_MAX"
bool IsOfStdint(std::string_view name) {
  const auto begins = [name](std::string_view word) { return name.starts_with(word); };
  const auto ends = [name](std::string_view word) { return name.ends_with(word); };
  return ((begins("int") || begins("uint")) && ends("_t")) ||
         ((begins("INT") || begins("UINT")) && (ends("_MAX") || ends("_MIN") || ends("_C")));
}

}  // namespace

bool IsReserved(std::string_view name) {
  if (name.starts_with("KRAL_") || name.starts_with("kral_cmd_") || name.starts_with("__")) return true;
  if (name.size() > 1 && name[0] == '_' && std::isupper(static_cast<unsigned char>(name[1])) != 0) return true;
  return IsOfStdint(name) || kReserved.find(Format(" {} ", name)) != std::string_view::npos;
}

std::string MacroName(std::string text) {
  for (char& character : text) {
    const bool plain = std::isalnum(static_cast<unsigned char>(character)) != 0;
    character = plain ? static_cast<char>(std::toupper(static_cast<unsigned char>(character))) : '_';
  }
  return text;
}

bool HeaderNames::MayAdd(const std::string& name, std::optional<std::int64_t> value) const {
  if (IsReserved(name)) return false;
  const auto known = names_.find(name);
  return known == names_.end() || (value && known->second == value);
}

bool HeaderNames::Add(const std::string& name, std::optional<std::int64_t> value) {
  return names_.emplace(name, value).second;
}

bool LocalNames::IsFree(const std::string& name) const {
  return !taken_.contains(name) && !header_.Has(name);
}

std::string LocalNames::Take(std::string path) {
  std::ranges::replace(path, '.', '_');
  if (IsReserved(path)) path += '_';
  while (!IsFree(path) || !IsFree(path + "_count") || !IsFree(path + "_size")) path += '_';
  taken_.insert({path, path + "_count", path + "_size"});
  return path;
}

}  // namespace kral::tool

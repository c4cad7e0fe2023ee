// Names of a C header that is being made: those it must not use, and those it has given.
#ifndef KRAL_TOOLS_CMD_C_NAMES_H
#define KRAL_TOOLS_CMD_C_NAMES_H

#include <cstdint>
#include <initializer_list>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>

namespace kral::tool {

// Whether the name means something to C or C++, to the text of the header, or may be the library's.
bool IsReserved(std::string_view name);

// "WLAN_TX_START_RATE_11M" of "WLAN_TX_START_rate_11M".
std::string MacroName(std::string text);

// What is known in the whole header: functions, types, and macros with their values.
class HeaderNames {
 public:
  // Whether the name is free; a macro may be told again with the value that it has.
  bool MayAdd(const std::string& name, std::optional<std::int64_t> value = std::nullopt) const;
  // False for one that is there.
  bool Add(const std::string& name, std::optional<std::int64_t> value = std::nullopt);
  bool Has(const std::string& name) const { return names_.contains(name); }

 private:
  std::map<std::string, std::optional<std::int64_t>> names_;
};

// Of the parameters of a function, or the members of a struct. A macro would stand in the place of one of its name.
class LocalNames {
 public:
  LocalNames(const HeaderNames& header, std::initializer_list<std::string> own) : header_(header), taken_(own) {}

  // The name of a field by its path, made free; with "_count" and "_size" behind it, it is free as well.
  std::string Take(std::string path);

 private:
  bool IsFree(const std::string& name) const;

  const HeaderNames& header_;
  std::set<std::string> taken_;
};

}  // namespace kral::tool

#endif

// What the tool prints: data on stdout, as text or as one JSON object, and everything else on stderr.
#ifndef KRAL_TOOLS_OUTPUT_H
#define KRAL_TOOLS_OUTPUT_H

#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "tools/kral/exit_codes.h"
#include "tools/kral/json.h"
#include "tools/kral/lane.h"

namespace kral::tool {

inline constexpr int kSchema = 1;  // of the objects; grows when a member changes its meaning or goes

class Output {
 public:
  void UseJson() { json_ = true; }
  bool json() const { return json_; }
  // Results and notes go there from now on, as does progress; it must live as long.
  void UseLane(Lane& lane) { lane_ = &lane; }
  Lane* lane() const { return lane_; }

  // The result of a verb: `members` join "ok" in the object; `text` is what a person reads, with its line ends.
  void Result(const Json& members, std::string_view text) const;

  // A piece of a text that is no result by itself.
  void Data(std::string_view text) const;

  // One of many: an object of its own on a line of its own, without "ok". The result of the verb follows behind the
  // last.
  void Stream(const Json& members, std::string_view text) const;

  // Something worth knowing that is not the result; with --json an object with the member "event", as progress is.
  void Note(std::string_view text) const;

  // The end of a failed verb. `members` is what was found out before it failed, if anything.
  void Failure(const ToolError& error, const Json& members = Json::object()) const;

 private:
  void WriteObject(bool ok, const Json& members) const;

  bool json_ = false;
  Lane* lane_ = nullptr;
};

// "error" of an object that tells a failure.
Json ErrorJson(const ToolError& error);

// On the standard error. That nobody reads it any more is no reason to stop anything.
void WriteAside(std::string_view text) noexcept;

// One line. Texts may come from command lines, from the system and from handsets: an invalid UTF-8 byte is replaced,
// and the controls that JSON lets pass (DEL, 80 to 9F), which a terminal may obey, are escaped like all others.
std::string JsonLine(const Json& object);

// A text of the handset made fit for a terminal and for JSON: padding cut, anything but printable ASCII shown as '?'.
std::string Printable(std::string_view text);

// Two upper-case digits per byte, separated by blanks.
std::string HexText(std::span<const std::uint8_t> bytes);
// Sixteen bytes a line: offset, hex, characters.
std::string HexDump(std::span<const std::uint8_t> bytes);

}  // namespace kral::tool

#endif

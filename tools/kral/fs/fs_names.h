// Names and paths of both sides: the handset's, with '/' between names, and what may become a file of the PC.
#ifndef KRAL_TOOLS_FS_FS_NAMES_H
#define KRAL_TOOLS_FS_FS_NAMES_H

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace kral::tool {

// ":/nv/item" on the command line is the handset's "/nv/item"; so is the path without a colon where nothing else can
// be meant. Empty is the root.
std::string EfsPath(std::string_view argument);
bool IsEfsArgument(std::string_view argument);  // with a colon

// The names of a path, one after another, without those that lead nowhere: "" and ".".
std::vector<std::string> EfsNames(std::string_view path);
std::string JoinEfs(std::string_view folder, std::string_view name);
std::string_view LastEfsName(std::string_view path);  // empty for the root
std::string_view LastName(std::string_view path);     // of the PC's side; empty for a root
std::string_view ParentOf(std::string_view path);     // of the handset's side; "/" at the top

// Whether a name that the handset gave can be a file inside a folder of the PC, and of no other place. The rule is the
// same on both platforms: what was fetched on one can be taken to the other.
bool IsSafeLocalName(std::string_view name);

std::string ModeText(std::uint32_t mode);     // "-rw-r--r--"
std::string TimeText(std::uint32_t seconds);  // "2023-11-14 22:13:20", in UTC
std::string ErrorText(std::uint32_t error_number);

}  // namespace kral::tool

#endif

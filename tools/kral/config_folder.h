// Where the tool keeps what a user has settled once: ~/.config/kral, or kral in the folder of a Windows user's
// settings.
#ifndef KRAL_TOOLS_CONFIG_FOLDER_H
#define KRAL_TOOLS_CONFIG_FOLDER_H

#include <string>

namespace kral::tool {

// A file of that name in it. ToolError where the environment names no folder.
std::string ConfigFile(const std::string& name);
// Makes the folders that lead to a file; ToolError.
void MakeFoldersOf(const std::string& file);

}  // namespace kral::tool

#endif

// Whether two names lead to one file: what a verb writes must not be what it reads.
#ifndef KRAL_TOOLS_ONE_FILE_H
#define KRAL_TOOLS_ONE_FILE_H

#include <string>

namespace kral::tool {

// Also by way of links, and of a file that is yet to be made.
bool IsOneFile(const std::string& one, const std::string& other);

// ToolError when the file that an option names for the result is the one that is read.
void RefuseSource(const std::string& source, const std::string& target, const char* option);

}  // namespace kral::tool

#endif

// Between the UTF-8 of the library and the UTF-16 of the system.
#ifndef KRAL_PLATFORM_WIN32_WIDE_TEXT_H
#define KRAL_PLATFORM_WIN32_WIDE_TEXT_H

#include <string>
#include <string_view>

namespace kral {

// Bytes that are no UTF-8 are taken for the system's ANSI code page, in which older programs name their files.
std::wstring WideText(std::string_view text);
std::string Utf8Text(std::wstring_view text);

// The name of a file as the system's functions take it: a path that is too long for plain names, by itself or behind
// the current folder, gets the form that may be longer.
std::wstring WidePath(const std::string& path);
// What a path means, from the root of its drive on; empty when it means nothing.
std::wstring FullPath(const std::wstring& path);

}  // namespace kral

#endif

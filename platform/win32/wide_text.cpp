#include "platform/win32/wide_text.h"

#include <windows.h>

namespace kral {
namespace {

// A plain name has 259 characters, that of a folder 247. A file being written has a longer name than its target.
constexpr size_t kLongestPlainPath = 200;

// False when the bytes are none of the code page.
bool Widen(UINT code_page, DWORD flags, std::string_view text, std::wstring& wide) {
  const int length = static_cast<int>(text.size());
  const int size = ::MultiByteToWideChar(code_page, flags, text.data(), length, nullptr, 0);
  if (size <= 0) return false;
  wide.resize(static_cast<size_t>(size));
  return ::MultiByteToWideChar(code_page, flags, text.data(), length, wide.data(), size) == size;
}

}  // namespace

std::wstring WideText(std::string_view text) {
  std::wstring wide;
  if (text.empty() || Widen(CP_UTF8, MB_ERR_INVALID_CHARS, text, wide) || Widen(CP_ACP, 0, text, wide)) return wide;
  return {};
}

std::string Utf8Text(std::wstring_view text) {
  if (text.empty()) return {};
  const int length = static_cast<int>(text.size());
  const int size = ::WideCharToMultiByte(CP_UTF8, 0, text.data(), length, nullptr, 0, nullptr, nullptr);
  std::string utf8(static_cast<size_t>(size), '\0');
  ::WideCharToMultiByte(CP_UTF8, 0, text.data(), length, utf8.data(), size, nullptr, nullptr);
  return utf8;
}

std::wstring FullPath(const std::wstring& path) {
  std::wstring full;
  // With too little room, what is needed is told, the end included.
  for (DWORD room = MAX_PATH; room > full.size();) {
    full.resize(room);
    room = ::GetFullPathNameW(path.c_str(), room, full.data(), nullptr);
    if (room < full.size()) full.resize(room);
  }
  return full;
}

std::wstring WidePath(const std::string& path) {
  std::wstring wide = WideText(path);
  const std::wstring full = FullPath(wide);
  if (full.size() <= kLongestPlainPath) return wide;
  // Devices, and what is in the long form already.
  if (full.starts_with(L"\\\\.\\") || full.starts_with(L"\\\\?\\")) return wide;
  if (full.starts_with(L"\\\\")) return L"\\\\?\\UNC" + full.substr(1);
  return L"\\\\?\\" + full;
}

}  // namespace kral

// Compound documents on Windows, by OLE structured storage over memory.
#include "platform/compound_file.h"

#include <objbase.h>
#include <windows.h>

#include <algorithm>
#include <cstdio>
#include <memory>
#include <utility>

#include "platform/compound_chains.h"

namespace kral {
namespace {

struct Release {
  void operator()(IUnknown* object) const { object->Release(); }
};
template <class T>
using Owned = std::unique_ptr<T, Release>;

struct FreeTaskMemory {
  void operator()(wchar_t* text) const { ::CoTaskMemFree(text); }
};

constexpr DWORD kReadMode = STGM_READ | STGM_SHARE_EXCLUSIVE;
constexpr DWORD kWriteMode = STGM_READWRITE | STGM_SHARE_EXCLUSIVE | STGM_CREATE;

std::string Reason(const char* what, HRESULT result) {
  char text[80];
  std::snprintf(text, sizeof text, "%s (0x%08lX)", what, static_cast<unsigned long>(result));
  return text;
}

std::string ToUtf8(const wchar_t* text) {
  const int size = ::WideCharToMultiByte(CP_UTF8, 0, text, -1, nullptr, 0, nullptr, nullptr);
  if (size <= 1) return {};
  std::string utf8(static_cast<size_t>(size), '\0');
  ::WideCharToMultiByte(CP_UTF8, 0, text, -1, utf8.data(), size, nullptr, nullptr);
  utf8.pop_back();  // the terminator
  return utf8;
}

std::wstring ToWide(const std::string& utf8) {
  const int size = ::MultiByteToWideChar(CP_UTF8, 0, utf8.c_str(), -1, nullptr, 0);
  if (size <= 1) return {};
  std::wstring wide(static_cast<size_t>(size), L'\0');
  ::MultiByteToWideChar(CP_UTF8, 0, utf8.c_str(), -1, wide.data(), size);
  wide.pop_back();
  return wide;
}

// Walks a storage; gives the reason why the walk had to stop, or an empty text.
class Reader {
 public:
  std::string Read(IStorage* source, CompoundStorage& storage, size_t depth) {
    if (depth > kCompoundDepthLimit) return "storages nested too deeply";
    IEnumSTATSTG* found = nullptr;
    if (const HRESULT result = source->EnumElements(0, nullptr, 0, &found); FAILED(result))
      return Reason("the entries cannot be listed", result);
    const Owned<IEnumSTATSTG> entries(found);
    STATSTG entry{};
    while (entries->Next(1, &entry, nullptr) == S_OK) {
      const std::unique_ptr<wchar_t, FreeTaskMemory> name(entry.pwcsName);
      if (++entries_ > kCompoundEntryLimit) return "too many entries";
      std::string problem = ReadEntry(source, entry, storage, depth);
      if (!problem.empty()) return problem;
    }
    return {};
  }

 private:
  std::string ReadEntry(IStorage* source, const STATSTG& entry, CompoundStorage& storage, size_t depth) {
    if (entry.type == STGTY_STORAGE) {
      IStorage* opened = nullptr;
      const HRESULT result = source->OpenStorage(entry.pwcsName, nullptr, kReadMode, nullptr, 0, &opened);
      if (FAILED(result)) return Reason("a storage cannot be opened", result);
      const Owned<IStorage> child(opened);
      CompoundStorage& added = storage.storages.emplace_back();
      added.name = ToUtf8(entry.pwcsName);
      return Read(child.get(), added, depth + 1);
    }
    if (entry.type != STGTY_STREAM) return {};
    if (entry.cbSize.QuadPart > kCompoundFileLimit - bytes_) return "a stream is too large";
    IStream* opened = nullptr;
    const HRESULT result = source->OpenStream(entry.pwcsName, nullptr, kReadMode, 0, &opened);
    if (FAILED(result)) return Reason("a stream cannot be opened", result);
    const Owned<IStream> stream(opened);
    CompoundStream& added = storage.streams.emplace_back();
    added.name = ToUtf8(entry.pwcsName);
    return ReadStream(stream.get(), static_cast<size_t>(entry.cbSize.QuadPart), added);
  }

  std::string ReadStream(IStream* stream, size_t size, CompoundStream& added) {
    bytes_ += size;
    added.bytes.resize(size);
    size_t used = 0;
    while (used < size) {
      ULONG received = 0;
      const auto room = static_cast<ULONG>(size - used);
      if (FAILED(stream->Read(added.bytes.data() + used, room, &received)) || received == 0)
        return "stream " + added.name + " is cut short";
      used += received;
    }
    return {};
  }

  size_t entries_ = 0;
  size_t bytes_ = 0;
};

HRESULT WriteStream(IStorage* target, const CompoundStream& stream) {
  IStream* created = nullptr;
  HRESULT result = target->CreateStream(ToWide(stream.name).c_str(), kWriteMode, 0, 0, &created);
  if (FAILED(result)) return result;
  const Owned<IStream> output(created);
  ULONG written = 0;
  if (!stream.bytes.empty())
    result = output->Write(stream.bytes.data(), static_cast<ULONG>(stream.bytes.size()), &written);
  return SUCCEEDED(result) && written != stream.bytes.size() ? STG_E_MEDIUMFULL : result;
}

HRESULT WriteChildren(IStorage* target, const CompoundStorage& storage) {
  for (const CompoundStream& stream : storage.streams) {
    if (const HRESULT result = WriteStream(target, stream); FAILED(result)) return result;
  }
  for (const CompoundStorage& child : storage.storages) {
    IStorage* created = nullptr;
    HRESULT result = target->CreateStorage(ToWide(child.name).c_str(), kWriteMode, 0, 0, &created);
    if (FAILED(result)) return result;
    const Owned<IStorage> opened(created);
    if (result = WriteChildren(opened.get(), child); FAILED(result)) return result;
  }
  return target->Commit(STGC_DEFAULT);
}

// Structured storage works on memory through a movable block.
Owned<ILockBytes> MakeLockBytes(std::span<const uint8_t> content) {
  HGLOBAL block = ::GlobalAlloc(GMEM_MOVEABLE, std::max<size_t>(content.size(), 1));
  if (block == nullptr) return nullptr;
  if (void* memory = ::GlobalLock(block)) {
    std::copy(content.begin(), content.end(), static_cast<uint8_t*>(memory));
    ::GlobalUnlock(block);
  }
  ILockBytes* bytes = nullptr;
  if (FAILED(::CreateILockBytesOnHGlobal(block, TRUE, &bytes))) {
    ::GlobalFree(block);
    return nullptr;
  }
  const ULARGE_INTEGER size{{static_cast<DWORD>(content.size()), 0}};
  bytes->SetSize(size);
  return Owned<ILockBytes>(bytes);
}

std::string CopyOut(ILockBytes* bytes, std::vector<uint8_t>& file) {
  STATSTG state{};
  if (const HRESULT result = bytes->Stat(&state, STATFLAG_NONAME); FAILED(result))
    return Reason("the compound document cannot be measured", result);
  std::vector<uint8_t> content(static_cast<size_t>(state.cbSize.QuadPart));
  ULONG received = 0;
  const HRESULT result = bytes->ReadAt(ULARGE_INTEGER{}, content.data(), static_cast<ULONG>(content.size()), &received);
  if (FAILED(result) || received != content.size()) return Reason("the compound document cannot be copied", result);
  file = std::move(content);
  return {};
}

}  // namespace

std::string ParseCompoundFile(std::span<const uint8_t> file, CompoundStorage& root) {
  if (!CompoundChainsEnd(file)) return "a compound document whose chains do not end";
  const Owned<ILockBytes> bytes = MakeLockBytes(file);
  if (!bytes) return "out of memory";
  IStorage* opened = nullptr;
  const HRESULT result = ::StgOpenStorageOnILockBytes(bytes.get(), nullptr, kReadMode, nullptr, 0, &opened);
  if (FAILED(result)) return Reason("not a compound document", result);
  const Owned<IStorage> storage(opened);
  CompoundStorage tree;
  std::string problem = Reader().Read(storage.get(), tree, 0);
  if (problem.empty()) root = std::move(tree);
  return problem;
}

std::string SerializeCompoundFile(const CompoundStorage& root, std::vector<uint8_t>& file) {
  const Owned<ILockBytes> bytes = MakeLockBytes({});
  if (!bytes) return "out of memory";
  IStorage* created = nullptr;
  HRESULT result = ::StgCreateDocfileOnILockBytes(bytes.get(), kWriteMode, 0, &created);
  if (FAILED(result)) return Reason("the compound document cannot be begun", result);
  Owned<IStorage> storage(created);
  result = WriteChildren(storage.get(), root);
  storage.reset();  // flushes into the memory
  if (FAILED(result)) return Reason("the compound document cannot be written", result);
  return CopyOut(bytes.get(), file);
}

}  // namespace kral

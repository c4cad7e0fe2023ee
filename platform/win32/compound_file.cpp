// Writes compound documents on Windows, by OLE structured storage over memory.
#include "platform/compound_file.h"

#include <objbase.h>
#include <windows.h>

#include <algorithm>
#include <cstdio>
#include <memory>
#include <utility>

#include "platform/win32/com_object.h"
#include "platform/win32/wide_text.h"

namespace kral {
namespace {

constexpr DWORD kWriteMode = STGM_READWRITE | STGM_SHARE_EXCLUSIVE | STGM_CREATE;

std::string Reason(const char* what, HRESULT result) {
  char text[80];
  std::snprintf(text, sizeof text, "%s (0x%08lX)", what, static_cast<unsigned long>(result));
  return text;
}

HRESULT WriteStream(IStorage* target, const CompoundStream& stream) {
  IStream* created = nullptr;
  HRESULT result = target->CreateStream(WideText(stream.name).c_str(), kWriteMode, 0, 0, &created);
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
    HRESULT result = target->CreateStorage(WideText(child.name).c_str(), kWriteMode, 0, 0, &created);
    if (FAILED(result)) return result;
    const Owned<IStorage> opened(created);
    if (result = WriteChildren(opened.get(), child); FAILED(result)) return result;
  }
  return target->Commit(STGC_DEFAULT);
}

// Structured storage works on memory through a movable block.
Owned<ILockBytes> MakeLockBytes() {
  HGLOBAL block = ::GlobalAlloc(GMEM_MOVEABLE, 1);
  ILockBytes* bytes = nullptr;
  if (block != nullptr && FAILED(::CreateILockBytesOnHGlobal(block, TRUE, &bytes))) ::GlobalFree(block);
  if (bytes != nullptr) bytes->SetSize(ULARGE_INTEGER{});
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

std::string SerializeCompoundFile(const CompoundStorage& root, std::vector<uint8_t>& file) {
  const Owned<ILockBytes> bytes = MakeLockBytes();
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

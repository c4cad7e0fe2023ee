// What the exports of the NV tool are made of: name line, handle, the handset's lock, the item that is meant, the error
// code. No exception leaves them.
#ifndef KRAL_STORAGE_NV_NV_TOOL_CALL_H
#define KRAL_STORAGE_NV_NV_TOOL_CALL_H

#include <memory>
#include <mutex>
#include <string>

#include "base/text_argument.h"
#include "frame/export_call.h"
#include "storage/nv/nv_tool.h"

namespace kral::nv {

inline std::shared_ptr<FamilyObject> MakeTool(Diag_FTM&, KRAL_HANDLE handle) {
  return std::make_shared<NVTool_Manager>(handle);
}

// Runs operation(tool, phone) under the request lock of the handset. Where nobody said more, the error code is the
// failure.
template <class Operation>
uint32_t OnTool(KRAL_HANDLE handle, const char* function, Operation&& operation) {
  const NvError error =
      ExportCall(handle, function)
          .Result(NvError::kNoConnection, NvError::kUnknown, NvError::kNone, [&](Diag_FTM& phone) {
            const auto tool = Kral_ResourceManager::GetFamily<NVTool_Manager>(handle, FamilySlot::kNvManager, MakeTool);
            const Diag_FTM::Call call(phone);
            if (tool && tool->is_moving()) {
              Fail(Failure(KRAL_ERROR_ARGUMENT, "the NV tool is moving a set, and takes no calls from its callback"));
              return NvError::kUnknown;
            }
            const NvError told = tool ? operation(*tool, phone) : NvError::kNoConnection;
            if (told != NvError::kNone && NotedFailure() == KRAL_ERROR_NONE) Fail(ToolFailure(told));
            return told;
          });
  return static_cast<uint32_t>(error);
}

// An operation that cannot fail.
template <class Operation>
uint32_t OnToolAlways(KRAL_HANDLE handle, const char* name, Operation&& operation) noexcept {
  return OnTool(handle, name, [&](NVTool_Manager& tool, Diag_FTM& phone) {
    operation(tool, phone);
    return NvError::kNone;
  });
}

// --- The item that an argument names ---------------------------------------------------------------------------------

struct AtIndex {
  uint32_t index;
};

inline NvError Find(NVTool_Manager& tool, AtIndex at, NvItem*& item) {
  item = tool.definitions().At(at.index);
  if (item != nullptr) return NvError::kNone;
  return Told(NvError::kIndexOutOfBound, "there is no item with index " + std::to_string(at.index) + ": " +
                                             std::to_string(tool.definitions().count()) + " are defined");
}

inline NvError Find(NVTool_Manager& tool, uint16_t id, NvItem*& item) {
  item = tool.definitions().Find(id);
  if (item != nullptr) return NvError::kNone;
  return Told(NvError::kNotDefined, "NV item " + std::to_string(id) + " is not defined");
}

inline NvError Find(NVTool_Manager& tool, const char* path, NvItem*& item) {
  item = tool.definitions().Find(TextOrEmpty(path));
  if (item != nullptr) return NvError::kNone;
  return Told(NvError::kNotDefined, "the item file " + std::string(TextOrEmpty(path)) + " is not defined");
}

// Runs operation(tool, phone, item).
template <class Key, class Operation>
uint32_t OnItem(KRAL_HANDLE handle, const char* name, Key key, Operation&& operation) noexcept {
  return OnTool(handle, name, [&](NVTool_Manager& tool, Diag_FTM& phone) {
    NvItem* item = nullptr;
    const NvError error = Find(tool, key, item);
    return error == NvError::kNone ? operation(tool, phone, *item) : error;
  });
}

}  // namespace kral::nv

#endif

// The NV tool of one handset: definitions, current values, filters, and the moving of sets.
#ifndef KRAL_STORAGE_NV_NV_TOOL_H
#define KRAL_STORAGE_NV_NV_TOOL_H

#include <cstdint>
#include <functional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "kral/nv_tool.h"
#include "storage/nv/nv_definition_xml.h"
#include "storage/nv/nv_definitions.h"
#include "storage/nv/nv_error.h"
#include "storage/nv/nv_filter.h"
#include "storage/nv/nv_mobile.h"
#include "storage/nv/nv_source.h"
#include "storage/pkv/pkv_set.h"

namespace kral::nv {

// Every function runs under the request lock of the phone object that it is given, which is always the same one.
class NVTool_Manager final : public FamilyObject {
 public:
  explicit NVTool_Manager(KRAL_HANDLE handle) : handle_(handle) {}

  void SetCallback(KRAL_NV_CALLBACK callback) { callback_ = callback; }
  // True within the callback: the items of the set must stay where they are.
  bool is_moving() const { return moving_; }

  // --- Definitions (nv_tool.cpp) -------------------------------------------------------------------------------------
  NvError LoadDefinitions(Diag_FTM& phone, const std::string& file, NvDefinitionKind kind);
  void ClearDefinitions();
  NvDefinitions& definitions() { return definitions_; }
  std::string FileNames();

  // --- Values of the current subscription; a null item is one that is not there --------------------------------------
  NvError GetValue(const NvItem& item, uint16_t element, const NvBytes*& value) const;
  NvError SetBytes(Diag_FTM& phone, NvItem& item, uint16_t element, std::span<const uint8_t> value);
  NvError SetText(Diag_FTM& phone, NvItem& item, uint16_t element, std::string_view text);
  void ClearValue(NvItem& item) const;
  void ClearValues();

  // --- Filters -------------------------------------------------------------------------------------------------------
  NvError LoadReadFilter(Diag_FTM& phone, const std::string& file);
  NvError LoadWriteFilter(Diag_FTM& phone, const std::string& file);
  void ClearReadFilters(Diag_FTM& phone);
  void ClearWriteFilters(Diag_FTM& phone);
  // Of the items that have a value, or have none.
  NvError CreateFilter(const std::string& file, bool with_value);

  // --- Subscriptions -------------------------------------------------------------------------------------------------
  void SetMultiSim(bool supported);
  uint16_t subscription() const { return subscription_; }
  NvError SetSubscription(uint16_t subscription);

  // --- The handset (nv_tool_mobile.cpp) ------------------------------------------------------------------------------
  NvError LoadFromMobile(Diag_FTM& phone);
  NvError WriteToMobile(Diag_FTM& phone);
  NvError ReadItem(Diag_FTM& phone, uint16_t id, uint16_t& status);
  NvError ReadItem(Diag_FTM& phone, const std::string& path);
  NvError WriteItem(Diag_FTM& phone, const NvItem& item, uint16_t& status);

  // --- Files of the PC (nv_tool_files.cpp) ---------------------------------------------------------------------------
  NvError LoadFromPkv(Diag_FTM& phone, const std::string& file);
  NvError WriteToPkv(Diag_FTM& phone, const std::string& file);
  NvError LoadFromSource(Diag_FTM& phone, const std::string& file);
  NvError WriteToSource(Diag_FTM& phone, const std::string& file);
  NvError ComparePkv(Diag_FTM& phone, const std::string& first, const std::string& second, const std::string& page);
  NvError GenerateQdf(const std::string& file);

 private:
  class Walk;

  NvSlot SlotOf(const NvItem& item, uint16_t element) const;
  NvItem& Define(Diag_FTM& phone, NvItem item);  // a made-up definition, logged
  void Mark(Diag_FTM& phone, NvItem& item) const;
  void MarkAll(Diag_FTM& phone);
  std::vector<NvItem*> Chosen(bool NvItem::*mark);
  NvError LoadFilter(Diag_FTM& phone, const std::string& file, NvFilter& filter);

  items::PhoneItems::Answer DefineItemFiles(Diag_FTM& phone, NvMobile& mobile);
  NvError ReadElement(Diag_FTM& phone, NvMobile& mobile, NvItem& item, uint16_t element, uint16_t& status);
  NvError ReadWhole(Diag_FTM& phone, NvItem& item, uint16_t& status);
  NvError WriteElement(Diag_FTM& phone, NvMobile& mobile, const NvItem& item, NvSlot slot, const NvBytes& value,
                       uint16_t& status) const;

  struct PkvArrays;
  NvItem* ItemOfPkv(Diag_FTM& phone, const pkv::PkvNvItem& entry, const PkvArrays& arrays);
  NvError TakeStored(Diag_FTM& phone, NvItem& item, NvSlot slot, std::span<const uint8_t> stored,
                     uint32_t failure);  // the KRAL_ERROR_ code of bytes that do not fit
  NvError TakeFile(Diag_FTM& phone, const pkv::PkvEfsFile& entry);
  // The highest index of the id in the source file makes an item that nobody defined an array.
  NvError TakeSource(Diag_FTM& phone, const NvSourceItem& entry, uint16_t highest_index);
  bool AppendToPkv(Diag_FTM& phone, const NvItem& item, NvSlot slot, const NvBytes& value, pkv::PkvSet& set) const;

  const KRAL_HANDLE handle_;
  KRAL_NV_CALLBACK callback_ = nullptr;
  bool moving_ = false;
  NvDefinitions definitions_;
  NvRoamingLists roaming_lists_;
  NvFilter read_filter_;
  NvFilter write_filter_;
  bool multi_sim_ = false;
  uint16_t subscription_ = 0;
};

// Reports each item of a set to the callback, and remembers whether one of them failed. The first that did is the one
// whose failure stays noted, whatever the later ones get over.
class NVTool_Manager::Walk {
 public:
  Walk(NVTool_Manager& tool, uint32_t operation, size_t total)
      : tool_(tool), operation_(operation), total_(static_cast<uint32_t>(total)) {
    tool_.moving_ = true;
  }
  ~Walk() { tool_.moving_ = false; }
  Walk(const Walk&) = delete;
  Walk& operator=(const Walk&) = delete;

  void Report(const std::string& title, NvError error);
  bool failed() const { return failed_; }

 private:
  NVTool_Manager& tool_;
  const uint32_t operation_;
  const uint32_t total_;
  uint32_t done_ = 0;
  bool failed_ = false;
  FailureMark first_;
};

}  // namespace kral::nv

#endif

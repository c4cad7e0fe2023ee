// What the NV tool knows: the definitions of items, the data types that they share, and the current values.
#ifndef KRAL_STORAGE_NV_NV_DEFINITIONS_H
#define KRAL_STORAGE_NV_NV_DEFINITIONS_H

#include <compare>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "storage/nv/nv_data_type.h"

namespace kral::nv {

using NvBytes = std::vector<uint8_t>;
using NvTypePtr = std::shared_ptr<const NvDataType>;

inline constexpr uint16_t kHighestElement = 255;

// Which of an item's values: of which subscription, and of which element of an array item.
struct NvSlot {
  uint16_t subscription = 0;
  uint16_t element = 0;

  auto operator<=>(const NvSlot&) const = default;
};

// An item has an NV id or, when it is a file of the handset, a path. An RF NV item has both.
struct NvItem {
  std::optional<uint16_t> id;
  std::string path;
  std::string name;
  std::string version;
  NvTypePtr type;
  uint16_t max_index = 0;  // of the highest element; 0: no array
  bool compressed = false;
  bool generic = false;  // made up for an item that nobody defined
  uint32_t mode = 0;     // kind and permissions of the file where it was seen last; 0: nowhere
  bool will_read = true;
  bool will_write = true;
  std::map<NvSlot, NvBytes> values;

  bool is_file() const { return !path.empty(); }
  bool is_array() const { return max_index > 0; }
  std::string Title() const;  // "NV ID 453" or the path, for log lines
};

// The id in the path of an RF NV item: /nv/item_files/rfnv/00020001 is 20001, also without the first slash; nothing for
// other paths.
std::optional<uint16_t> RfIdOfPath(std::string_view path);

// Whether a path can get a generic definition: it fits a request and can stand in XML, reports and logs.
bool IsUsualPath(std::string_view path);

class NvDefinitions {
 public:
  // --- Data types ----------------------------------------------------------------------------------------------------
  NvTypePtr FindType(std::string_view name) const;
  void PutType(NvTypePtr type);  // replaces one of the same name, for items that are still to be defined

  // --- Items: numbered ones first, then files ------------------------------------------------------------------------
  size_t numbered_count() const { return numbered_.size(); }
  size_t file_count() const { return files_.size(); }
  size_t count() const { return numbered_.size() + files_.size(); }

  NvItem* At(size_t index);  // null beyond the end
  NvItem* Find(uint16_t id);
  NvItem* FindNumbered(uint16_t id);    // no file
  NvItem* Find(std::string_view path);  // however it is spelled

  // The item takes the place of one with the same id or file, whose values are gone: true when that was not made up.
  bool Put(NvItem item);
  void Clear();

  template <class Visit>
  void ForEach(Visit visit) {
    for (NvItem& item : numbered_) visit(item);
    for (NvItem& item : files_) visit(item);
  }

 private:
  std::vector<NvItem> numbered_;
  std::vector<NvItem> files_;
  std::unordered_map<uint16_t, size_t> by_id_;       // of numbered items
  std::unordered_map<uint16_t, size_t> by_rf_id_;    // of files
  std::unordered_map<std::string, size_t> by_path_;  // pkv::PathKey
  std::unordered_map<std::string, NvTypePtr> types_;
};

}  // namespace kral::nv

#endif

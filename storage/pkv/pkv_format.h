// The layout of PKV backup files: the names in the compound document and the records in its streams.
//
//   File_Version                        two double words: major and minor number of this layout
//   Default_Phone_Configuration/
//     Mobile_Property_Info              the version text of the library, then lines of name=value
//     NV_ITEM_ARRAY[_SIM_<n>]           array records; without a suffix: subscription 0
//     NV_NUMBERED_ITEMS[_SIM_<n>]/
//       <id, 8 digits>/<index, 8 digits>   one numbered record each
//     Provisioning_Item_Files/          item files
//       EFS_Dir/<number, 8 hex digits>  entry record of a file
//       EFS_Data/<the same number>      its content
//     EFS_Backup/                       files that are no item files: EFS_Dir and EFS_Data as above, and
//       NV_Items/                       an item array and numbered items of the backup's own
//     Feature_Mask, Roaming_List_<n>, EFS_FILES, DialingPlan, CarrierBranding   carried, not interpreted
#ifndef KRAL_STORAGE_PKV_PKV_FORMAT_H
#define KRAL_STORAGE_PKV_PKV_FORMAT_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

namespace kral::pkv {

// --- Names ----------------------------------------------------------------------------------------------------------

inline constexpr std::string_view kConfiguration = "Default_Phone_Configuration";
inline constexpr std::string_view kItemArray = "NV_ITEM_ARRAY";
inline constexpr std::string_view kNumberedItems = "NV_NUMBERED_ITEMS";
inline constexpr std::string_view kBackupItems = "NV_Items";
inline constexpr std::string_view kEfsBackup = "EFS_Backup";
inline constexpr std::string_view kEfsDirectory = "EFS_Dir";
inline constexpr std::string_view kEfsData = "EFS_Data";
inline constexpr std::string_view kItemFiles = "Provisioning_Item_Files";
inline constexpr std::string_view kPropertyInfo = "Mobile_Property_Info";
inline constexpr std::string_view kFileVersion = "File_Version";
inline constexpr std::string_view kFeatureMask = "Feature_Mask";
inline constexpr std::string_view kRoamingListPrefix = "Roaming_List_";
inline constexpr std::string_view kEfsFiles = "EFS_FILES";
inline constexpr std::string_view kEfsPrefix = "EFS_";
inline constexpr std::string_view kDialingPlan = "DialingPlan";
inline constexpr std::string_view kCarrierBranding = "CarrierBranding";

// "<name>" for subscription 0, "<name>_SIM_<n>" for the others.
std::string NameOfSubscription(std::string_view name, uint16_t subscription);
// The subscription that such a name tells; nothing for other names.
std::optional<uint16_t> SubscriptionOfName(std::string_view text, std::string_view name);

std::string NumberedName(uint32_t number);  // eight decimal digits
std::string EntryName(uint32_t number);     // eight upper-case hexadecimal digits
// What such names tell; nothing for any other text.
std::optional<uint32_t> NumberOfName(std::string_view name);
std::optional<uint32_t> EntryOfName(std::string_view name);

// Where an RF NV item lives in the handset's file system.
std::string RfNvPath(uint32_t item);

// What tells whether two paths are one file: with a slash in front, none doubled and none at the end. Handsets list
// some folders without the first one, definitions and callers write it; what goes to the handset stays as it was
// spelled.
std::string PathKey(std::string_view path);

// --- Records --------------------------------------------------------------------------------------------------------

inline constexpr size_t kItemDataSize = 128;

// Array record: length, flags, item id, index word, data.
inline constexpr size_t kArrayRecordSize = 136;
inline constexpr size_t kArrayFlags = 2;
inline constexpr size_t kArrayId = 4;
inline constexpr size_t kArrayIndex = 6;
inline constexpr size_t kArrayData = 8;
inline constexpr uint16_t kRecordInUse = 1;
static_assert(kArrayData + kItemDataSize == kArrayRecordSize);

// Numbered record: item id, index word, length, data. Deliberately in another order than the array record.
inline constexpr size_t kNumberedRecordSize = 134;
inline constexpr size_t kNumberedIndex = 2;
inline constexpr size_t kNumberedLength = 4;
inline constexpr size_t kNumberedData = 6;
static_assert(kNumberedData + kItemDataSize == kNumberedRecordSize);

// Entry record of a backed-up file: mode, size of the content, and the path, without a zero, up to the end.
inline constexpr size_t kEntrySize = 4;
inline constexpr size_t kEntryPath = 8;

inline constexpr uint32_t kLayoutMajor = 1;
inline constexpr uint32_t kLayoutMinor = 0;

// How the parts of a file are opened; the numbers are those of structured storage.
enum class Access : uint32_t {
  kRead = 0x10,       // exclusive share + read
  kReadWrite = 0x12,  // exclusive share + read and write; creates (0x1000 added) what is missing
};

// One NV item as files and handsets keep it.
struct PkvNvItem {
  uint16_t id = 0;
  uint16_t index = 0;  // index word: 0 for a plain item
  uint16_t subscription = 0;
  uint16_t status = 0;  // of the handset; not kept in files
  std::array<uint8_t, kItemDataSize> data{};

  bool operator==(const PkvNvItem&) const = default;
};

std::array<uint8_t, kArrayRecordSize> ArrayRecord(const PkvNvItem& item);
std::array<uint8_t, kNumberedRecordSize> NumberedRecord(const PkvNvItem& item);
// The length words are not looked at here. False when there are too few bytes.
bool ParseArrayRecord(std::span<const uint8_t> bytes, PkvNvItem& item, uint16_t& flags);
bool ParseNumberedRecord(std::span<const uint8_t> bytes, PkvNvItem& item);

}  // namespace kral::pkv

#endif

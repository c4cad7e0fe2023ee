// A PKV file as a set of items and files: what backups, restores and the NV tool move about. Read whole, written whole.
#ifndef KRAL_STORAGE_PKV_PKV_SET_H
#define KRAL_STORAGE_PKV_PKV_SET_H

#include <cstdint>
#include <string>
#include <vector>

#include "storage/pkv/file_section.h"
#include "storage/pkv/phone_storage_file.h"
#include "storage/pkv/pkv_format.h"

namespace kral {

class DataLogFileHandler;

namespace pkv {

struct PkvSet {
  std::vector<PkvNvItem> items;
  std::vector<PkvEfsFile> files;
  PkvProperties properties{PkvVersionText(), {}};
  std::vector<std::string> unread;  // of the file that was read: what it holds beside these, a line for each part
};

enum class PkvResult {
  kDone,
  kCannotOpen,   // not there, not readable, no compound document
  kNoStorage,    // a compound document, but no PKV file
  kDamagedItem,  // an item or a file in it cannot be read
  kNoItem,       // not written: VARN_PkvFile holds no file without an item
  kCannotWrite,
};

// `text` tells why, for people; empty when done.
struct PkvOutcome {
  PkvResult result = PkvResult::kDone;
  std::string text;

  bool done() const { return result == PkvResult::kDone; }
};

// Items come in rising order of subscription, id and index, each of these once; files in their own order, each path
// once, however it is spelled. What comes a second time with another content is unread. On a failure the set is as
// before.
PkvOutcome ReadPkv(const std::string& path, PkvSet& set);

// Says what a file holds beside what was read.
void LogUnread(DataLogFileHandler& log, const std::string& path, const PkvSet& set);

enum class PkvWriter { kStorageClasses, kVarnPkvFile };

// As the station is set up: VARN_PkvFile where the registry key SOFTWARE\Kral\VARN\UsePkvFile (Windows) or the
// environment variable KRAL_USE_PKV_FILE (Linux) is there.
PkvWriter ChosenPkvWriter();

// Items whose status is not 0 have no value and are left out. The file is
// replaced in one step; after a failure it is as it was. `log`, if given, gets a line per item and one at the end.
PkvOutcome WritePkv(const std::string& path, const PkvSet& set, DataLogFileHandler* log = nullptr,
                    PkvWriter writer = ChosenPkvWriter());

}  // namespace pkv
}  // namespace kral

#endif

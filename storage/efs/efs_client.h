// The EFS2 client: what a caller can have done with the handset's files. Null outputs are not wanted; "errno" below is
// the handset's error number, handed out whenever it answered.
#ifndef KRAL_STORAGE_EFS_EFS_CLIENT_H
#define KRAL_STORAGE_EFS_EFS_CLIENT_H

#include <cstdint>

#include "frame/diag_ftm.h"
#include "kral/efs.h"
#include "storage/efs/efs_settings.h"
#include "transport/engine/reply.h"

namespace kral::efs {

// --- Settings (efs_settings.cpp); without the request lock --------------------------------------------------------
bool SetPacketSizes(Diag_FTM& phone, uint16_t read_size, uint16_t write_size);
bool SetAutomaticPacketSizes(Diag_FTM& phone, bool on);
bool SetCallbacks(Diag_FTM& phone, KRAL_HANDLE context, KRAL_EFS_TRANSFER_CALLBACK transfer,
                  KRAL_EFS_DIRECTORY_CALLBACK directory);

// --- Aborts (efs_settings.cpp) ------------------------------------------------------------------------------------
bool Abort(Diag_FTM& phone);  // without the request lock

// What is made of many transfers and listings, each of which forgets earlier calls of Abort, ends with one of them.
class AbortWatch {
 public:
  explicit AbortWatch(Diag_FTM& phone) : aborts_(phone.state<Settings>().aborts), before_(aborts_) {}
  bool aborted() const { return aborts_ != before_; }  // since this was made

 private:
  const std::atomic<uint32_t>& aborts_;
  const uint32_t before_;
};

// The same for a job that sends requests of other kinds too: while it lives, an abort ends the wait for any reply. With
// the request lock held.
class AbortableJob : public AbortWatch {
 public:
  explicit AbortableJob(Diag_FTM& phone);
  ~AbortableJob();
  AbortableJob(const AbortableJob&) = delete;
  AbortableJob& operator=(const AbortableJob&) = delete;

 private:
  Diag_FTM& phone_;
  const std::atomic<bool>* former_ = nullptr;
};

// --- Transfers (efs_write.cpp, efs_read.cpp) ------------------------------------------------------------------------
bool WriteFromFile(Diag_FTM& phone, const char* local_file, const char* efs_file);
bool WriteFromMemory(Diag_FTM& phone, const uint8_t* buffer, uint32_t size, const char* efs_file);
bool ReadToFile(Diag_FTM& phone, const char* local_file, const char* efs_file);
bool ReadToMemory(Diag_FTM& phone, const char* efs_file, uint8_t* buffer, uint32_t* size);

// --- Item files (efs_item.cpp) ---------------------------------------------------------------------------------------
bool PutItemFromFile(Diag_FTM& phone, const char* local_file, const char* efs_file);
bool PutItemFromMemory(Diag_FTM& phone, const char* efs_file, const uint8_t* buffer, uint32_t size);
bool GetItemToFile(Diag_FTM& phone, const char* local_file, const char* efs_file, uint32_t length);

// --- Directories (efs_directory.cpp, efs_names.cpp) ------------------------------------------------------------------
bool ListDirectory(Diag_FTM& phone, const char* folder, uint8_t filter, KRAL_EFS_ENTRY* entries, uint32_t* count);
bool MakeDirectoryOnce(Diag_FTM& phone, const char* folder, uint32_t* error_number);  // also when it is there
Reply RemoveDirectory(Diag_FTM& phone, const char* folder, uint32_t* error_number);

// --- Names and files, one request each (efs_names.cpp) ---------------------------------------------------------------
struct FileStatus {
  uint32_t error_number = 0;
  uint32_t mode = 0;
  uint32_t size = 0;
  uint32_t link_count = 0;
  uint32_t access_time = 0;
  uint32_t modify_time = 0;
  uint32_t change_time = 0;

  bool exists() const { return error_number == 0; }
  bool is_item_file() const;
};
struct StatOutputs {
  uint32_t* error_number;
  uint32_t* mode;
  uint32_t* size;
  uint32_t* link_count;
  uint32_t* access_time;
  uint32_t* modify_time;
  uint32_t* change_time;
};
bool StatInto(Diag_FTM& phone, const char* path, const StatOutputs& outputs);
Reply Unlink(Diag_FTM& phone, const char* path, uint32_t* error_number);
Reply CreateLink(Diag_FTM& phone, const char* target, const char* link, uint32_t* error_number);
bool ReadLink(Diag_FTM& phone, const char* link, uint32_t* error_number, char* target, uint32_t size);
Reply Rename(Diag_FTM& phone, const char* old_path, const char* new_path, uint32_t* error_number);
Reply ChangeMode(Diag_FTM& phone, const char* path, uint16_t mode, uint32_t* error_number);
Reply Access(Diag_FTM& phone, const char* path, uint16_t permission_bits, uint32_t* error_number);

// --- The file system (efs_file_system.cpp, efs_sync.cpp) -------------------------------------------------------------
bool FileSystemStatus(Diag_FTM& phone, const char* path, uint32_t* error_number, KRAL_EFS_STATFS* status);
bool UsedSpace(Diag_FTM& phone, const char* path, uint64_t* used);
bool DeviceInfo(Diag_FTM& phone, uint32_t* error_number, KRAL_EFS_DEVICE_INFO* info);
bool ExtendedInfo(Diag_FTM& phone, uint32_t query, uint32_t* error_number, uint32_t* data_type, uint32_t* number,
                  char* text, uint32_t text_size);
bool SyncWithWait(Diag_FTM& phone, const char* path, uint32_t time_out_ms);
bool MakeGoldenCopy(Diag_FTM& phone, const char* path, uint32_t* error_number);

}  // namespace kral::efs

#endif

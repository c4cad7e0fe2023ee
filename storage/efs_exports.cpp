// Exports of the EFS2 client: name line, handle, operation.
#include "frame/base/text_argument.h"
#include "frame/export_call.h"
#include "kral/efs.h"
#include "storage/efs_client.h"
#include "storage/efs_server_client.h"

namespace efs = kral::efs;
using kral::EfsImageJob;
using kral::LogFormatted;
using kral::LogName;
using kral::OnPhone;
using kral::OnPhoneAtOnce;
using kral::TextOrEmpty;

namespace {

uint8_t ImageJob(KRAL_HANDLE handle, const char* name, EfsImageJob job, const char* image_file) {
  LogName(handle, name);
  return efs::RunImageJob(handle, job, image_file) ? 1 : 0;
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_SetEfsReadAndWritePacketSize(KRAL_HANDLE handle, uint16_t read_size, uint16_t write_size) {
  LogFormatted(handle, "KRAL_SetEfsReadAndWritePacketSize( iEFS_Read_Size = %d,  iEFS_Write_Size = %d)", read_size,
               write_size);
  return OnPhoneAtOnce(handle, efs::SetPacketSizes, read_size, write_size);
}

uint8_t KRAL_CALL KRAL_ConfigureEfs2CallBacks(KRAL_HANDLE handle, KRAL_EFS_TRANSFER_CALLBACK transfer,
                                              KRAL_EFS_DIRECTORY_CALLBACK directory) {
  LogName(handle, "KRAL_ConfigureEfs2CallBacks");
  return OnPhoneAtOnce(handle, efs::SetCallbacks, handle, transfer, directory);
}

uint8_t KRAL_CALL KRAL_AbortEFS_Operation(KRAL_HANDLE handle) {
  LogName(handle, "KRAL_AbortEFS_Operation");
  return OnPhoneAtOnce(handle, efs::Abort);
}

uint8_t KRAL_CALL KRAL_EfsWrite(KRAL_HANDLE handle, const char* local_file, const char* efs_file) {
  LogFormatted(handle, "KRAL_EfsWrite( sLocalFile = %s, sEFS_File = %s)", TextOrEmpty(local_file),
               TextOrEmpty(efs_file));
  return OnPhone(handle, efs::WriteFromFile, local_file, efs_file);
}

uint8_t KRAL_CALL KRAL_EfsWriteMem(KRAL_HANDLE handle, const uint8_t* buffer, uint32_t size, const char* efs_file) {
  LogName(handle, "KRAL_EfsWriteMem");
  return OnPhone(handle, efs::WriteFromMemory, buffer, size, efs_file);
}

uint8_t KRAL_CALL KRAL_EfsRead(KRAL_HANDLE handle, const char* local_file, const char* efs_file) {
  LogName(handle, "KRAL_EfsRead");
  return OnPhone(handle, efs::ReadToFile, local_file, efs_file);
}

uint8_t KRAL_CALL KRAL_EfsReadMem(KRAL_HANDLE handle, const char* efs_file, uint8_t* buffer, uint32_t* size) {
  LogName(handle, "KRAL_EfsReadMem");
  return OnPhone(handle, efs::ReadToMemory, efs_file, buffer, size);
}

uint8_t KRAL_CALL KRAL_Efs2PutItem(KRAL_HANDLE handle, const char* local_file, const char* efs_file) {
  LogName(handle, "KRAL_Efs2PutItem");
  return OnPhone(handle, efs::PutItemFromFile, local_file, efs_file);
}

uint8_t KRAL_CALL KRAL_EfsPutItemFromMem(KRAL_HANDLE handle, const char* efs_file, const uint8_t* buffer,
                                         uint32_t size) {
  LogName(handle, "KRAL_EfsPutItemFromMem");
  return OnPhone(handle, efs::PutItemFromMemory, efs_file, buffer, size);
}

uint8_t KRAL_CALL KRAL_Efs2GetItem(KRAL_HANDLE handle, const char* local_file, const char* efs_file, uint32_t length) {
  LogName(handle, "KRAL_Efs2GetItem");
  return OnPhone(handle, efs::GetItemToFile, local_file, efs_file, length);
}

uint8_t KRAL_CALL KRAL_EfsDirectory(KRAL_HANDLE handle, const char* folder, uint8_t filter, KRAL_EFS_ENTRY* entries,
                                    uint32_t* count) {
  LogFormatted(handle, "KRAL_EfsDirectory( sFolderPath = %s )", TextOrEmpty(folder));
  return OnPhone(handle, efs::ListDirectory, folder, filter, entries, count);
}

uint8_t KRAL_CALL KRAL_EfsMkDir(KRAL_HANDLE handle, const char* folder, uint32_t* error_number) {
  LogName(handle, "KRAL_EfsMkDir");
  return OnPhone(handle, efs::MakeDirectory, folder, error_number);
}

uint8_t KRAL_CALL KRAL_EfsRmDir(KRAL_HANDLE handle, const char* folder, uint32_t* error_number) {
  LogName(handle, "KRAL_EfsRmDir");
  return OnPhone(handle, efs::RemoveDirectory, folder, error_number);
}

uint8_t KRAL_CALL KRAL_EfsDelete(KRAL_HANDLE handle, const char* efs_file, uint32_t* error_number) {
  LogName(handle, "KRAL_EfsDelete");
  return OnPhone(handle, efs::Unlink, efs_file, error_number);
}

uint8_t KRAL_CALL KRAL_EfsCreateLink(KRAL_HANDLE handle, const char* target, const char* link, uint32_t* error_number) {
  LogName(handle, "KRAL_EfsCreateLink");
  return OnPhone(handle, efs::CreateLink, target, link, error_number);
}

uint8_t KRAL_CALL KRAL_EfsReadLink(KRAL_HANDLE handle, const char* link, uint32_t* error_number, char* target,
                                   uint32_t size) {
  LogName(handle, "KRAL_EfsReadLink");
  return OnPhone(handle, efs::ReadLink, link, error_number, target, size);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_RENAME(KRAL_HANDLE handle, const char* old_path, const char* new_path,
                                        uint32_t* error_number) {
  LogName(handle, "KRAL_EFS2_DIAG_RENAME");
  return OnPhone(handle, efs::Rename, old_path, new_path, error_number);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_STAT(KRAL_HANDLE handle, const char* path, uint32_t* error_number, uint32_t* mode,
                                      uint32_t* size, uint32_t* link_count, uint32_t* access_time,
                                      uint32_t* modify_time, uint32_t* change_time) {
  LogName(handle, "KRAL_EFS2_DIAG_STAT");
  return OnPhone(handle, efs::StatInto, path,
                 efs::StatOutputs{error_number, mode, size, link_count, access_time, modify_time, change_time});
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_CHMOD(KRAL_HANDLE handle, const char* path, uint16_t mode, uint32_t* error_number) {
  LogName(handle, "KRAL_EFS2_DIAG_CHMOD");
  return OnPhone(handle, efs::ChangeMode, path, mode, error_number);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_ACCESS(KRAL_HANDLE handle, const char* path, uint16_t permission_bits,
                                        uint32_t* error_number) {
  LogName(handle, "KRAL_EFS2_DIAG_ACCESS");
  return OnPhone(handle, efs::Access, path, permission_bits, error_number);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_STATFS(KRAL_HANDLE handle, const char* path, uint32_t* error_number,
                                        KRAL_EFS_STATFS* status) {
  LogName(handle, "KRAL_EFS2_DIAG_STATFS");
  return OnPhone(handle, efs::FileSystemStatus, path, error_number, status);
}

uint8_t KRAL_CALL KRAL_EFS2_GetGroupInfo(KRAL_HANDLE handle, const char* path, uint64_t* used) {
  LogName(handle, "KRAL_EFS2_GetGroupInfo");
  return OnPhone(handle, efs::UsedSpace, path, used);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_DEV_INFO(KRAL_HANDLE handle, uint32_t* error_number, KRAL_EFS_DEVICE_INFO* info) {
  LogName(handle, "KRAL_EFS2_DIAG_DEV_INFO");
  return OnPhone(handle, efs::DeviceInfo, error_number, info);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_EXTENDED_INFO(KRAL_HANDLE handle, uint32_t query, uint32_t* error_number,
                                               uint32_t* data_type, uint32_t* number, char* text, uint32_t text_size) {
  LogName(handle, "KRAL_EFS2_DIAG_EXTENDED_INFO");
  return OnPhone(handle, efs::ExtendedInfo, query, error_number, data_type, number, text, text_size);
}

uint8_t KRAL_CALL KRAL_EFS2_SyncWithWait(KRAL_HANDLE handle, const char* path, uint32_t time_out) {
  LogName(handle, "KRAL_EFS2_SyncWithWait");
  return OnPhone(handle, efs::SyncWithWait, path, time_out);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_MAKE_GOLDEN_COPY(KRAL_HANDLE handle, const char* path, uint32_t* error_number) {
  LogName(handle, "KRAL_EFS2_DIAG_MAKE_GOLDEN_COPY");
  return OnPhone(handle, efs::MakeGoldenCopy, path, error_number);
}

uint8_t KRAL_CALL KRAL_EfsRmTree(KRAL_HANDLE handle, const char* folder) {
  LogName(handle, "KRAL_EfsRmTree");
  return efs::RemoveTree(handle, folder) ? 1 : 0;
}

uint8_t KRAL_CALL KRAL_BackupCEFS_Legacy(KRAL_HANDLE handle, const char* image_file) {
  return ImageJob(handle, "KRAL_BackupCEFS_Legacy", EfsImageJob::kBackupLegacy, image_file);
}

uint8_t KRAL_CALL KRAL_BackupCEFS_Alternate(KRAL_HANDLE handle, const char* image_file) {
  return ImageJob(handle, "KRAL_BackupCEFS_Alternate", EfsImageJob::kBackupAlternate, image_file);
}

uint8_t KRAL_CALL KRAL_UploadCEFS_File(KRAL_HANDLE handle, const char* image_file) {
  return ImageJob(handle, "KRAL_UploadCEFS_File", EfsImageJob::kUploadFile, image_file);
}

uint8_t KRAL_CALL KRAL_UploadCEFS_File2(KRAL_HANDLE handle, const char* image_file) {
  return ImageJob(handle, "KRAL_UploadCEFS_File2", EfsImageJob::kUploadFile2, image_file);
}

uint8_t KRAL_CALL KRAL_UploadCEFS_ImageAlternate(KRAL_HANDLE handle, const char* image_file) {
  return ImageJob(handle, "KRAL_UploadCEFS_ImageAlternate", EfsImageJob::kUploadImageAlternate, image_file);
}

uint8_t KRAL_CALL KRAL_DownloadCEFS_File(KRAL_HANDLE handle, const char* image_file) {
  return ImageJob(handle, "KRAL_DownloadCEFS_File", EfsImageJob::kDownloadFile, image_file);
}

}  // extern "C"

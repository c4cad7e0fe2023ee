// Exports of the EFS2 client: name line, handle, operation.
#include "base/text_argument.h"
#include "frame/export_call.h"
#include "kral/efs.h"
#include "storage/efs/efs_client.h"
#include "storage/efs/efs_server_client.h"

namespace efs = kral::efs;
using kral::EfsImageJob;
using kral::ExportCall;
using kral::TextOrEmpty;

extern "C" {

uint8_t KRAL_CALL KRAL_SetEfsReadAndWritePacketSize(KRAL_HANDLE handle, uint16_t read_size, uint16_t write_size) {
  return ExportCall(handle, __func__)
      .Logged("( iEFS_Read_Size = %d,  iEFS_Write_Size = %d)", read_size, write_size)
      .RunAtOnce(efs::SetPacketSizes, read_size, write_size);
}

uint8_t KRAL_CALL KRAL_SetEfsAutomaticPacketSize(KRAL_HANDLE handle, uint8_t on) {
  return ExportCall(handle, __func__).RunAtOnce(efs::SetAutomaticPacketSizes, on != 0);
}

uint8_t KRAL_CALL KRAL_ConfigureEfs2CallBacks(KRAL_HANDLE handle, KRAL_EFS_TRANSFER_CALLBACK transfer,
                                              KRAL_EFS_DIRECTORY_CALLBACK directory) {
  return ExportCall(handle, __func__).RunAtOnce(efs::SetCallbacks, handle, transfer, directory);
}

uint8_t KRAL_CALL KRAL_AbortEFS_Operation(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).RunAtOnce(efs::Abort);
}

uint8_t KRAL_CALL KRAL_EfsWrite(KRAL_HANDLE handle, const char* local_file, const char* efs_file) {
  return ExportCall(handle, __func__)
      .Logged("( sLocalFile = %s, sEFS_File = %s)", TextOrEmpty(local_file), TextOrEmpty(efs_file))
      .Run(efs::WriteFromFile, local_file, efs_file);
}

uint8_t KRAL_CALL KRAL_EfsWriteMem(KRAL_HANDLE handle, const uint8_t* buffer, uint32_t size, const char* efs_file) {
  return ExportCall(handle, __func__).Run(efs::WriteFromMemory, buffer, size, efs_file);
}

uint8_t KRAL_CALL KRAL_EfsRead(KRAL_HANDLE handle, const char* local_file, const char* efs_file) {
  return ExportCall(handle, __func__).Run(efs::ReadToFile, local_file, efs_file);
}

uint8_t KRAL_CALL KRAL_EfsReadMem(KRAL_HANDLE handle, const char* efs_file, uint8_t* buffer, uint32_t* size) {
  return ExportCall(handle, __func__).Run(efs::ReadToMemory, efs_file, buffer, size);
}

uint8_t KRAL_CALL KRAL_Efs2PutItem(KRAL_HANDLE handle, const char* local_file, const char* efs_file) {
  return ExportCall(handle, __func__).Run(efs::PutItemFromFile, local_file, efs_file);
}

uint8_t KRAL_CALL KRAL_EfsPutItemFromMem(KRAL_HANDLE handle, const char* efs_file, const uint8_t* buffer,
                                         uint32_t size) {
  return ExportCall(handle, __func__).Run(efs::PutItemFromMemory, efs_file, buffer, size);
}

uint8_t KRAL_CALL KRAL_Efs2GetItem(KRAL_HANDLE handle, const char* local_file, const char* efs_file, uint32_t length) {
  return ExportCall(handle, __func__).Run(efs::GetItemToFile, local_file, efs_file, length);
}

uint8_t KRAL_CALL KRAL_EfsDirectory(KRAL_HANDLE handle, const char* folder, uint8_t filter, KRAL_EFS_ENTRY* entries,
                                    uint32_t* count) {
  return ExportCall(handle, __func__)
      .Logged("( sFolderPath = %s )", TextOrEmpty(folder))
      .Run(efs::ListDirectory, folder, filter, entries, count);
}

uint8_t KRAL_CALL KRAL_EfsMkDir(KRAL_HANDLE handle, const char* folder, uint32_t* error_number) {
  return ExportCall(handle, __func__).Run(efs::MakeDirectoryOnce, folder, error_number);
}

uint8_t KRAL_CALL KRAL_EfsRmDir(KRAL_HANDLE handle, const char* folder, uint32_t* error_number) {
  return ExportCall(handle, __func__).Run(efs::RemoveDirectory, folder, error_number);
}

uint8_t KRAL_CALL KRAL_EfsDelete(KRAL_HANDLE handle, const char* efs_file, uint32_t* error_number) {
  return ExportCall(handle, __func__).Run(efs::Unlink, efs_file, error_number);
}

uint8_t KRAL_CALL KRAL_EfsCreateLink(KRAL_HANDLE handle, const char* target, const char* link, uint32_t* error_number) {
  return ExportCall(handle, __func__).Run(efs::CreateLink, target, link, error_number);
}

uint8_t KRAL_CALL KRAL_EfsReadLink(KRAL_HANDLE handle, const char* link, uint32_t* error_number, char* target,
                                   uint32_t size) {
  return ExportCall(handle, __func__).Run(efs::ReadLink, link, error_number, target, size);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_RENAME(KRAL_HANDLE handle, const char* old_path, const char* new_path,
                                        uint32_t* error_number) {
  return ExportCall(handle, __func__).Run(efs::Rename, old_path, new_path, error_number);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_STAT(KRAL_HANDLE handle, const char* path, uint32_t* error_number, uint32_t* mode,
                                      uint32_t* size, uint32_t* link_count, uint32_t* access_time,
                                      uint32_t* modify_time, uint32_t* change_time) {
  return ExportCall(handle, __func__)
      .Run(efs::StatInto, path,
           efs::StatOutputs{error_number, mode, size, link_count, access_time, modify_time, change_time});
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_CHMOD(KRAL_HANDLE handle, const char* path, uint16_t mode, uint32_t* error_number) {
  return ExportCall(handle, __func__).Run(efs::ChangeMode, path, mode, error_number);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_ACCESS(KRAL_HANDLE handle, const char* path, uint16_t permission_bits,
                                        uint32_t* error_number) {
  return ExportCall(handle, __func__).Run(efs::Access, path, permission_bits, error_number);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_STATFS(KRAL_HANDLE handle, const char* path, uint32_t* error_number,
                                        KRAL_EFS_STATFS* status) {
  return ExportCall(handle, __func__).Run(efs::FileSystemStatus, path, error_number, status);
}

uint8_t KRAL_CALL KRAL_EFS2_GetGroupInfo(KRAL_HANDLE handle, const char* path, uint64_t* used) {
  return ExportCall(handle, __func__).Run(efs::UsedSpace, path, used);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_DEV_INFO(KRAL_HANDLE handle, uint32_t* error_number, KRAL_EFS_DEVICE_INFO* info) {
  return ExportCall(handle, __func__).Run(efs::DeviceInfo, error_number, info);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_EXTENDED_INFO(KRAL_HANDLE handle, uint32_t query, uint32_t* error_number,
                                               uint32_t* data_type, uint32_t* number, char* text, uint32_t text_size) {
  return ExportCall(handle, __func__).Run(efs::ExtendedInfo, query, error_number, data_type, number, text, text_size);
}

uint8_t KRAL_CALL KRAL_EFS2_SyncWithWait(KRAL_HANDLE handle, const char* path, uint32_t time_out) {
  return ExportCall(handle, __func__).Run(efs::SyncWithWait, path, time_out);
}

uint8_t KRAL_CALL KRAL_EFS2_DIAG_MAKE_GOLDEN_COPY(KRAL_HANDLE handle, const char* path, uint32_t* error_number) {
  return ExportCall(handle, __func__).Run(efs::MakeGoldenCopy, path, error_number);
}

uint8_t KRAL_CALL KRAL_EfsRmTree(KRAL_HANDLE handle, const char* folder) {
  return ExportCall(handle, __func__).Run(efs::RemoveTree, folder);
}

uint8_t KRAL_CALL KRAL_BackupCEFS_Legacy(KRAL_HANDLE handle, const char* image_file) {
  return ExportCall(handle, __func__).Run(efs::RunImageJob, EfsImageJob::kBackupLegacy, image_file);
}

uint8_t KRAL_CALL KRAL_BackupCEFS_Alternate(KRAL_HANDLE handle, const char* image_file) {
  return ExportCall(handle, __func__).Run(efs::RunImageJob, EfsImageJob::kBackupAlternate, image_file);
}

uint8_t KRAL_CALL KRAL_UploadCEFS_File(KRAL_HANDLE handle, const char* image_file) {
  return ExportCall(handle, __func__).Run(efs::RunImageJob, EfsImageJob::kUploadFile, image_file);
}

uint8_t KRAL_CALL KRAL_UploadCEFS_File2(KRAL_HANDLE handle, const char* image_file) {
  return ExportCall(handle, __func__).Run(efs::RunImageJob, EfsImageJob::kUploadFile2, image_file);
}

uint8_t KRAL_CALL KRAL_UploadCEFS_ImageAlternate(KRAL_HANDLE handle, const char* image_file) {
  return ExportCall(handle, __func__).Run(efs::RunImageJob, EfsImageJob::kUploadImageAlternate, image_file);
}

uint8_t KRAL_CALL KRAL_DownloadCEFS_File(KRAL_HANDLE handle, const char* image_file) {
  return ExportCall(handle, __func__).Run(efs::RunImageJob, EfsImageJob::kDownloadFile, image_file);
}

}  // extern "C"

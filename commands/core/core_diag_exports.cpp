// Exports of the core diagnostic commands: name line, handle, operation.
#include "commands/core/core_diag.h"
#include "frame/export_call.h"
#include "kral/diag.h"

namespace diag = kral::diag;
using kral::ExportCall;

extern "C" {

uint8_t KRAL_CALL KRAL_DIAG_VERNO_F(KRAL_HANDLE handle, char* compile_date, char* compile_time, char* release_date,
                                    char* release_time, char* version_directory, uint8_t* station_class_mark,
                                    uint8_t* air_interface_revision, uint8_t* mobile_model, uint16_t* firmware_revision,
                                    uint8_t* slot_cycle_index, uint8_t* vocoder_major, uint8_t* vocoder_minor) {
  const diag::VersionOutputs outputs{compile_date,      compile_time,       release_date,           release_time,
                                     version_directory, station_class_mark, air_interface_revision, mobile_model,
                                     firmware_revision, slot_cycle_index,   vocoder_major,          vocoder_minor};
  return ExportCall(handle, __func__).Run(diag::ReadVersion, outputs);
}

uint8_t KRAL_CALL KRAL_DIAG_MEMORY_PEEK_F(KRAL_HANDLE handle, uint32_t address, uint16_t count, uint8_t* data) {
  return ExportCall(handle, __func__).Run(diag::PeekBytes, address, count, data);
}

uint8_t KRAL_CALL KRAL_DIAG_MEMORY_PEEK_WORD_F(KRAL_HANDLE handle, uint32_t address, uint16_t count, uint16_t* data) {
  return ExportCall(handle, __func__).Run(diag::PeekWords, address, count, data);
}

uint8_t KRAL_CALL KRAL_DIAG_MEMORY_PEEK_DWORD_F(KRAL_HANDLE handle, uint32_t address, uint16_t count, uint32_t* data) {
  return ExportCall(handle, __func__).Run(diag::PeekDoubleWords, address, count, data);
}

uint8_t KRAL_CALL KRAL_DIAG_MEMORY_POKE_F(KRAL_HANDLE handle, uint32_t address, uint16_t count, const uint8_t* data,
                                          uint8_t* status) {
  return ExportCall(handle, __func__).Run(diag::PokeBytes, address, count, data, status);
}

uint8_t KRAL_CALL KRAL_DIAG_MEMORY_POKE_WORD_F(KRAL_HANDLE handle, uint32_t address, uint16_t count,
                                               const uint16_t* data, uint8_t* status) {
  return ExportCall(handle, __func__).Run(diag::PokeWords, address, count, data, status);
}

uint8_t KRAL_CALL KRAL_DIAG_MEMORY_POKE_DWORD_F(KRAL_HANDLE handle, uint32_t address, uint16_t count,
                                                const uint32_t* data, uint8_t* status) {
  return ExportCall(handle, __func__).Run(diag::PokeDoubleWords, address, count, data, status);
}

uint8_t KRAL_CALL KRAL_DIAG_HS_KEY_F(KRAL_HANDLE handle, uint8_t hold, uint8_t key) {
  return ExportCall(handle, __func__).Run(diag::PressKey, hold, key);
}

uint8_t KRAL_CALL KRAL_DIAG_CONTROL_F(KRAL_HANDLE handle, uint16_t mode) {
  return ExportCall(handle, __func__).Run(diag::ControlMode, mode);
}

uint8_t KRAL_CALL KRAL_DIAG_ERR_READ_F(KRAL_HANDLE handle, uint16_t* size, uint8_t* records) {
  return ExportCall(handle, __func__).Run(diag::ReadErrorLog, size, records);
}

uint8_t KRAL_CALL KRAL_DIAG_ERR_CLEAR_F(KRAL_HANDLE handle, uint8_t record) {
  return ExportCall(handle, __func__).Run(diag::ClearErrorRecord, record);
}

uint8_t KRAL_CALL KRAL_DIAG_GET_DIPSW_F(KRAL_HANDLE handle, uint16_t* switches) {
  return ExportCall(handle, __func__).Run(diag::GetSwitches, switches);
}

uint8_t KRAL_CALL KRAL_DIAG_SET_DIPSW_F(KRAL_HANDLE handle, uint16_t switches) {
  return ExportCall(handle, __func__).Run(diag::SetSwitches, switches);
}

uint8_t KRAL_CALL KRAL_DIAG_DLOAD_F(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run(diag::EnterDownload);
}

uint8_t KRAL_CALL KRAL_DIAG_SPC_F(KRAL_HANDLE handle, const char* code, uint8_t* result) {
  return ExportCall(handle, __func__).Run(diag::SendServiceCode, code, result);
}

uint8_t KRAL_CALL KRAL_DIAG_STATUS_F(KRAL_HANDLE handle, uint16_t* size, uint8_t* record) {
  return ExportCall(handle, __func__).Run(diag::ReadStatus, size, record);
}

uint8_t KRAL_CALL KRAL_DIAG_IS2000_STATUS_F(KRAL_HANDLE handle, uint16_t* size, uint8_t* record) {
  return ExportCall(handle, __func__).Run(diag::ReadIs2000Status, size, record);
}

uint8_t KRAL_CALL KRAL_DIAG_EXT_BUILD_ID_F(KRAL_HANDLE handle, uint32_t* hardware_version, uint32_t* mobile_model,
                                           char* software_revision, char* model) {
  return ExportCall(handle, __func__)
      .Run(diag::ReadExtendedBuildId, hardware_version, mobile_model, software_revision, model);
}

uint8_t KRAL_CALL KRAL_DIAG_SECURITY_FREEZE_F(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run(diag::FreezeSecurity);
}

uint8_t KRAL_CALL KRAL_DIAG_NV_CNV_DIAG_BACKUP_F(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run(diag::BackUpNv);
}

uint8_t KRAL_CALL KRAL_DIAG_READ_ESN_F(KRAL_HANDLE handle, uint32_t* serial) {
  return ExportCall(handle, __func__).Run(diag::ReadSerialNumber, serial);
}

uint8_t KRAL_CALL KRAL_DIAG_GSM_STATUS_F(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run(diag::RefuseGsmCallControl, __func__);
}

uint8_t KRAL_CALL KRAL_DIAG_GSM_CALL_ORIG_F(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run(diag::RefuseGsmCallControl, __func__);
}

uint8_t KRAL_CALL KRAL_DIAG_GSM_CALL_END_F(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run(diag::RefuseGsmCallControl, __func__);
}

}  // extern "C"

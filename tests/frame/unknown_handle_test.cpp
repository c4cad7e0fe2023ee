// A handle that is not, or no longer, known: every export with a plain result gives zero, touches no output and sends
// nothing.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <source_location>
#include <type_traits>

#include "kral/kral.h"
#include "tests/support/handset_ports.h"

namespace kral {
namespace {

// Where every pointer points; a text, too. No function of these writes more.
std::array<uint8_t, 8192> g_area;

template <class T>
T Argument() {
  if constexpr (!std::is_pointer_v<T>) {
    return static_cast<T>(1);
  } else if constexpr (std::is_function_v<std::remove_pointer_t<T>>) {
    return nullptr;
  } else {
    return reinterpret_cast<T>(g_area.data());
  }
}

template <class Result, class... Arguments>
Result Call(Result(KRAL_CALL* function)(KRAL_HANDLE, Arguments...), KRAL_HANDLE handle) {
  return function(handle, Argument<Arguments>()...);
}

template <auto kFunction>
void ExpectZero(KRAL_HANDLE handle) {
  g_area.fill(0xCC);
  g_area.back() = 0;
  const char* const name = std::source_location::current().function_name();  // with the function's own in it
  if constexpr (std::is_void_v<decltype(Call(kFunction, handle))>) {
    Call(kFunction, handle);
  } else {
    EXPECT_EQ(Call(kFunction, handle), 0) << name;
  }
  EXPECT_TRUE(std::all_of(g_area.begin(), g_area.end() - 1, [](uint8_t byte) { return byte == 0xCC; })) << name;
}

template <auto... kFunctions>
void ExpectZeroOfAll(KRAL_HANDLE handle) {
  (ExpectZero<kFunctions>(handle), ...);
}

TEST(UnknownHandle, GivesZeroAndNoTraffic) {
  test::HandsetPorts ports;
  auto& handset = ports.Add(3);
  const KRAL_HANDLE released = KRAL_ConnectServer(3);
  KRAL_DisconnectServer(released);
  const size_t opens = ports.opens().size();
  for (const KRAL_HANDLE handle : {released, KRAL_HANDLE{0}, KRAL_HANDLE{0xDEADBEEF}}) {
    ExpectZeroOfAll<
        KRAL_GetComPortNumber, KRAL_DisconnectServer, KRAL_IsPhoneConnected, KRAL_GetPortState, KRAL_ConfigureTimeOut,
        KRAL_GetTimeOut, KRAL_SetReceiveMode, KRAL_SetData2DiagSearch, KRAL_SendSync, KRAL_SendASync, KRAL_SendRAW,
        KRAL_SetStartFlag, KRAL_SetPacketMode, KRAL_FlushRxBuffer, KRAL_ConfigureCallBacks, KRAL_SetDTR_State,
        KRAL_SetRTS_State, KRAL_SetSendDataSerialWriteSizeLimit, KRAL_StartLogging, KRAL_StopLogging,
        KRAL_IsLoggingStarted, KRAL_SetLogFlags, KRAL_AddUserMessageToTextLog, KRAL_AddUserAsyncLogMessageToTextLog,
        KRAL_ConfigureLibraryTextLogCallBack, KRAL_DIAG_VERNO_F, KRAL_DIAG_EXT_BUILD_ID_F, KRAL_DIAG_READ_ESN_F,
        KRAL_DIAG_CONTROL_F, KRAL_DIAG_MEMORY_PEEK_F, KRAL_DIAG_MEMORY_PEEK_WORD_F, KRAL_DIAG_MEMORY_PEEK_DWORD_F,
        KRAL_DIAG_MEMORY_POKE_F, KRAL_DIAG_MEMORY_POKE_WORD_F, KRAL_DIAG_MEMORY_POKE_DWORD_F, KRAL_DIAG_HS_KEY_F,
        KRAL_DIAG_GET_DIPSW_F, KRAL_DIAG_SET_DIPSW_F, KRAL_DIAG_SPC_F, KRAL_DIAG_ERR_READ_F, KRAL_DIAG_ERR_CLEAR_F,
        KRAL_DIAG_STATUS_F, KRAL_DIAG_IS2000_STATUS_F, KRAL_DIAG_DLOAD_F, KRAL_DIAG_SECURITY_FREEZE_F,
        KRAL_DIAG_NV_CNV_DIAG_BACKUP_F, KRAL_DIAG_SetPhoneLoggingState, KRAL_DIAG_GetNextPhoneLog,
        KRAL_DIAG_WaitNextPhoneLog, KRAL_DIAG_ClearPhoneLogQueue, KRAL_DIAG_GetPhoneLogQueueSize,
        KRAL_DIAG_GetNextEvent, KRAL_DIAG_WaitNextEvent, KRAL_DIAG_ClearEventQueue, KRAL_DIAG_ClearCommandResponseQueue,
        KRAL_ConfigureCollectionCallBacks, KRAL_GetTrafficCounters, KRAL_DIAG_SetExtendedLogCode,
        KRAL_DIAG_AddExtendedLogCode, KRAL_DIAG_AddExtendedLogCodes, KRAL_DIAG_ClearExtendedLogCode,
        KRAL_DIAG_ClearExtendedLogCodes, KRAL_DIAG_ClearAllLogCodes, KRAL_DIAG_GetLogRanges, KRAL_DIAG_GetLogMask,
        KRAL_DIAG_SetEventMaskBit, KRAL_DIAG_SetEventMaskBits, KRAL_DIAG_SetEntireEventMaskState,
        KRAL_DIAG_GetEventMask, KRAL_LoadNameTable, KRAL_GetEventText, KRAL_GetLogCodeText,
        KRAL_ExtendedTextMessage_GetCategoryListSize, KRAL_ExtendedTextMessage_GetCategoryListItem,
        KRAL_ExtendedTextMessage_SetCategoryEnable, KRAL_StartCapture, KRAL_StopCapture, KRAL_StartPlayback,
        KRAL_StopPlayback, KRAL_GetPlaybackState, KRAL_DIAG_NV_READ_F, KRAL_DIAG_NV_WRITE_F, KRAL_DIAG_NV_READ_EXT_F,
        KRAL_DIAG_NV_WRITE_EXT_F, KRAL_DIAG_NV_READ_ARRAY_F, KRAL_DIAG_NV_WRITE_ARRAY_F,
        KRAL_DIAG_NV_WRITE_SetBatchMode, KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List, KRAL_DIAG_NV_WRITE_FlushBatchQueue,
        KRAL_PKV_ConfigureCallBack, KRAL_PKV_ConfigureBackup, KRAL_PKV_GetCounts, KRAL_BackupNVFromMobileToPKV,
        KRAL_RestoreNVFromPKV, KRAL_PKV_Verify, KRAL_UploadPkvFile, KRAL_DownloadPkvFile,
        KRAL_SetEfsReadAndWritePacketSize, KRAL_ConfigureEfs2CallBacks, KRAL_AbortEFS_Operation, KRAL_EfsWrite,
        KRAL_EfsWriteMem, KRAL_EfsRead, KRAL_EfsReadMem, KRAL_Efs2PutItem, KRAL_EfsPutItemFromMem, KRAL_Efs2GetItem,
        KRAL_EfsDirectory, KRAL_EfsMkDir, KRAL_EfsRmDir, KRAL_EfsDelete, KRAL_EfsCreateLink, KRAL_EfsReadLink,
        KRAL_EFS2_DIAG_RENAME, KRAL_EFS2_DIAG_STAT, KRAL_EFS2_DIAG_CHMOD, KRAL_EFS2_DIAG_ACCESS, KRAL_EFS2_DIAG_STATFS,
        KRAL_EFS2_GetGroupInfo, KRAL_EFS2_DIAG_DEV_INFO, KRAL_EFS2_DIAG_EXTENDED_INFO, KRAL_EFS2_SyncWithWait,
        KRAL_EFS2_DIAG_MAKE_GOLDEN_COPY, KRAL_EfsRmTree, KRAL_BackupCEFS_Legacy, KRAL_BackupCEFS_Alternate,
        KRAL_UploadCEFS_File, KRAL_UploadCEFS_File2, KRAL_UploadCEFS_ImageAlternate, KRAL_DownloadCEFS_File,
        KRAL_ConfigureDownloadCallBack, KRAL_AbortDownload, KRAL_KOVA_LoadFlashProgrammer, KRAL_KOVA_NOP,
        KRAL_KOVA_RESET, KRAL_KOVA_SW_VERSION, KRAL_STREAM_HELLO, KRAL_STREAM_ConfigureHello, KRAL_STREAM_SECURITY_MODE,
        KRAL_STREAM_PARTITION_TABLE, KRAL_STREAM_WriteImageFile, KRAL_STREAM_WriteImageMem, KRAL_Kivrat_Configure,
        KRAL_Kivrat_Connect, KRAL_Kivrat_DownloadFlashProgrammer, KRAL_Kivrat_End, KRAL_Kivrat_FlashAll,
        KRAL_SetKivratHelloBehavior, KRAL_GetKivratHelloBehavior, KRAL_FTM_SET_MODE_ID, KRAL_FTM_GET_MODE_ID,
        KRAL_FTM_SET_COMMAND_CODE, KRAL_FTM_GET_COMMAND_CODE, KRAL_IsFTM_Mode, KRAL_ChangeFTM_BootMode,
        KRAL_ChangeFTM_ModeRuntime, KRAL_FTM_SET_MODE, KRAL_FTM_SET_CHAN, KRAL_FTM_SET_TX_ON, KRAL_FTM_SET_TX_OFF,
        KRAL_FTM_SendCommand, KRAL_FTM_SendCommandTo>(handle);
  }
  EXPECT_EQ(handset.request_count(), 0u);
  EXPECT_EQ(ports.opens().size(), opens);
}

}  // namespace
}  // namespace kral

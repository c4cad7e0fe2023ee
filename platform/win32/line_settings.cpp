// Line settings by device control block.
#include "platform/win32/line_settings.h"

namespace kral {
namespace {

constexpr DWORD kLongestRead = 3'600'000;

// ERROR_GEN_FAILURE stands for a driver that refuses without a reason: a refusal must never read as success.
DWORD Refusal() {
  const DWORD code = ::GetLastError();
  return code != ERROR_SUCCESS ? code : ERROR_GEN_FAILURE;
}

DWORD ReadBlock(HANDLE port, DCB& block) {
  block = {};
  block.DCBlength = sizeof block;
  return ::GetCommState(port, &block) ? ERROR_SUCCESS : Refusal();
}

DWORD Apply(HANDLE port, DCB& block) {
  return ::SetCommState(port, &block) ? ERROR_SUCCESS : Refusal();
}

DWORD ApplyReadTimeOuts(HANDLE port, DWORD multiplier, DWORD constant) {
  COMMTIMEOUTS time_outs{};
  ::GetCommTimeouts(port, &time_outs);
  time_outs.ReadIntervalTimeout = MAXDWORD;
  time_outs.ReadTotalTimeoutMultiplier = multiplier;
  time_outs.ReadTotalTimeoutConstant = constant;
  time_outs.WriteTotalTimeoutMultiplier = 1;
  time_outs.WriteTotalTimeoutConstant = 50;
  return ::SetCommTimeouts(port, &time_outs) ? ERROR_SUCCESS : Refusal();
}

}  // namespace

DWORD ApplyLineSettings(HANDLE port, uint32_t baud_rate) {
  DCB block;
  if (const DWORD error = ReadBlock(port, block)) return error;
  block.BaudRate = baud_rate;
  block.ByteSize = 8;
  block.Parity = NOPARITY;
  block.StopBits = ONESTOPBIT;
  block.fBinary = TRUE;
  block.fParity = TRUE;  // checking is on, though there is no parity to check
  block.fOutxCtsFlow = FALSE;
  block.fOutxDsrFlow = FALSE;
  block.fDtrControl = DTR_CONTROL_DISABLE;
  block.fDsrSensitivity = FALSE;
  block.fTXContinueOnXoff = TRUE;
  block.fOutX = FALSE;
  block.fInX = FALSE;
  block.fErrorChar = FALSE;
  block.fNull = FALSE;
  block.fRtsControl = RTS_CONTROL_ENABLE;
  block.fAbortOnError = FALSE;
  block.XonLim = 0;
  block.XoffLim = 0;
  return Apply(port, block);
}

DWORD ChangeBaudRate(HANDLE port, uint32_t baud_rate) {
  DCB block;
  if (const DWORD error = ReadBlock(port, block)) return error;
  block.BaudRate = baud_rate;
  return Apply(port, block);
}

DWORD ApplyTimeOuts(HANDLE port) {
  return ApplyReadTimeOuts(port, 0, 0);
}

// The system knows this combination as "wait for the first byte", up to the constant, which then ends a read empty.
DWORD ApplyWaitingTimeOuts(HANDLE port) {
  return ApplyReadTimeOuts(port, MAXDWORD, kLongestRead);
}

}  // namespace kral

// Shows that the installed headers and library fit together. The null port has no handset: it always
// counts as connected, and every request on it fails.
#include <kral/kral.h>

#include <cstdio>

int main() {
  const KRAL_HANDLE handle = KRAL_ConnectServer(KRAL_PORT_NULL);
  const bool connected = handle != 0 && KRAL_IsPhoneConnected(handle) != 0;
  uint32_t serial = 0;
  const bool answered = KRAL_DIAG_READ_ESN_F(handle, &serial) != 0;
  KRAL_DisconnectServer(handle);
  std::printf("connected: %s, answered: %s\n", connected ? "yes" : "no", answered ? "yes" : "no");
  return connected && !answered ? 0 : 1;
}

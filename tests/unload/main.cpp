// unload LIBRARY: loads the library, connects and frees it, again and again, with and without a disconnect. A host that
// does so must live on.
#include <chrono>
#include <cstdio>
#include <cstdlib>

#include "kral/kral.h"
#include "tests/unload/library.h"

namespace {

using namespace kral::unload;

constexpr int kRounds = 200;
constexpr uint32_t kPort = 7;

uint32_t KRAL_CALL TakeAll(uintptr_t, uintptr_t, uint32_t, const uint8_t*, uint32_t*) {
  return 0;
}

uint32_t KRAL_CALL GiveNothing(uintptr_t, uintptr_t, uint32_t* count, uint8_t*) {
  *count = 0;
  return 0;
}

uint32_t KRAL_CALL Forget(uintptr_t, uintptr_t) {
  return 0;
}

void Require(bool holds, const char* sentence, int round) {
  if (holds) return;
  std::fprintf(stderr, "round %d: not so: %s\n", round, sentence);
  std::_Exit(1);
}

template <class Function>
Function* FunctionOf(void* library, const char* name) {
  void* const found = Find(library, name);
  Require(found != nullptr, name, -1);
  return reinterpret_cast<Function*>(found);
}

KRAL_HANDLE Connect(void* library) {
  const auto connect =
      FunctionOf<decltype(KRAL_ConnectServer_UserDefinedTransport)>(library, "KRAL_ConnectServer_UserDefinedTransport");
  return connect(kPort, 1, 1, TakeAll, GiveNothing, Forget);
}

void Disconnect(void* library, KRAL_HANDLE handle) {
  FunctionOf<decltype(KRAL_DisconnectServer)>(library, "KRAL_DisconnectServer")(handle);
}

void RunRounds(const char* file, bool disconnects) {
  for (int round = 0; round < kRounds; ++round) {
    void* const library = Load(file);
    Require(library != nullptr, "the library can be loaded", round);
    const KRAL_HANDLE handle = Connect(library);
    Require(handle != 0, "it connects", round);
    if (disconnects) Disconnect(library, handle);
    Free(library);
    Require(IsLoaded(file) == !(disconnects && kLeaves), "the library stays loaded while it has threads", round);
  }
}

// The disconnect of somebody's DllMain: the threads cannot end before it has come back.
void RunDisconnectUnderLoader(const char* file) {
  static void* library = nullptr;
  static KRAL_HANDLE handle = 0;
  library = Load(file);
  handle = Connect(library);
  const auto begin = std::chrono::steady_clock::now();
  RunWhileUnloading([] { Disconnect(library, handle); });
  const auto passed = std::chrono::steady_clock::now() - begin;
  Require(passed < std::chrono::seconds(10), "a disconnect while a library is unloaded ends", 0);
  Free(library);
}

}  // namespace

int main(int count, char** arguments) {
  if (count != 2) return 2;
  RunRounds(arguments[1], true);
  RunDisconnectUnderLoader(arguments[1]);
  RunRounds(arguments[1], false);
  std::printf("%d rounds with a disconnect, %d without\n", kRounds, kRounds);
  return 0;
}

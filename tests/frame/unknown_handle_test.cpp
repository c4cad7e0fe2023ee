// A handle that is not, or no longer, known: every export that takes one fails, touches no output and sends nothing.
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

// Those that need no connection, whatever the handle: the texts of codes, and why a call failed.
template <auto kFunction>
constexpr bool kNeedsNone = false;
template <>
constexpr bool kNeedsNone<KRAL_NV_GetErrorText> = true;
template <>
constexpr bool kNeedsNone<KRAL_GetLastError> = true;

template <auto kFunction>
void ExpectFailure(KRAL_HANDLE handle) {
  const char* const name = std::source_location::current().function_name();  // with the function's own in it
  using Result = decltype(Call(kFunction, handle));
  g_area.fill(0xCC);
  g_area.back() = 0;
  if constexpr (kNeedsNone<kFunction>) {
    return;
  } else if constexpr (std::is_void_v<Result>) {
    Call(kFunction, handle);
  } else {
    // The NV tool's functions give error codes, in which 0 is good.
    const auto failure = static_cast<Result>(std::is_same_v<Result, uint32_t> ? KRAL_NV_ERROR_NO_CONNECTION : 0);
    EXPECT_EQ(Call(kFunction, handle), failure) << name;
  }
  EXPECT_TRUE(std::all_of(g_area.begin(), g_area.end() - 1, [](uint8_t byte) { return byte == 0xCC; })) << name;
}

template <auto... kFunctions>
void ExpectFailureOfAll(KRAL_HANDLE handle) {
  static_assert(sizeof...(kFunctions) > 300);
  (ExpectFailure<kFunctions>(handle), ...);
}

TEST(UnknownHandle, FailsEveryCallWithoutTraffic) {
  test::HandsetPorts ports;
  auto& handset = ports.Add(3);
  const KRAL_HANDLE released = KRAL_ConnectServer(3);
  KRAL_DisconnectServer(released);
  const size_t opens = ports.opens().size();
  for (const KRAL_HANDLE handle : {released, KRAL_HANDLE{0}, KRAL_HANDLE{0xDEADBEEF}}) {
    ExpectFailureOfAll<
#include "tests/support/handle_functions.inc"
#include "tests/support/test.h"
        >(handle);
  }
  EXPECT_EQ(handset.request_count(), 0u);
  EXPECT_EQ(ports.opens().size(), opens);
}

}  // namespace
}  // namespace kral

// What every test needs: the framework, the standard library's everyday headers (parsed once for all tests, which is
// most of what a test file takes to compile), and the names with which they write down bytes and faults.
#ifndef KRAL_TESTS_SUPPORT_TEST_H
#define KRAL_TESTS_SUPPORT_TEST_H

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <cstring>
#include <deque>
#include <filesystem>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <random>
#include <set>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <tuple>
#include <utility>
#include <vector>

#include "handset/line/bytes.h"
#include "handset/line/faults.h"

namespace kral {

using handset::ByteView;
using handset::ByteWriter;
using handset::Fault;
using handset::FromHex;
using handset::HexText;
using handset::When;

// The time-out of a request that is answered at once: what a busy machine may need, and nothing has to wait for.
inline constexpr int32_t kAnswerInTimeMs = 5000;

}  // namespace kral

#endif

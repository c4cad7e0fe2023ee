// Loaders that answer with whatever they like: KOVA's and the flash programmer, from waking it to the end of an image.
// Every operation ends, and an image counts as written only when all of it was acknowledged.
//
// Byte 0 chooses the operation. Each request is answered with the next part, and as long as its bit 0 is set with the
// one behind it; beyond the last one with a code that answers nothing.
#include <cstdint>
#include <iterator>
#include <string>

#include "download/link/download_settings.h"
#include "fuzz/lying_handset.h"
#include "fuzz/support.h"
#include "kral/download.h"
#include "tests/support/temp_folder.h"

namespace {

using namespace kral;
using fuzz::Bytes;
using fuzz::ByteView;
using fuzz::Require;

// Every request is answered at once, but not every block is acknowledged.
constexpr int32_t kTimeOutMs = 20;
constexpr uint32_t kAcknowledgeMs = 3;
constexpr uint8_t kWrite = 7;
constexpr uint32_t kImageSize = 96;
constexpr uint32_t kBlock = 16;
constexpr uint8_t kAnswersNothing = 0xEE;

class LyingLoader {
 public:
  explicit LyingLoader(ByteView answers) : answers_(answers) {
    for (int code = 0; code <= UINT8_MAX; ++code) {
      lying_.phone().On(static_cast<uint8_t>(code), {},
                        [this](ByteView request, handset::Wire& wire) { Answer(request, wire); });
    }
    KRAL_ConfigureTimeOut(handle(), KRAL_TIME_OUT_COMMAND, kTimeOutMs);
    KRAL_STREAM_ConfigureHello(handle(), 1, 0);
    lying_.state<download::Settings>().acknowledge_limit_ms = kAcknowledgeMs;
  }

  KRAL_HANDLE handle() const { return lying_.handle(); }
  uint32_t writes() const { return writes_; }

 private:
  void Answer(ByteView request, handset::Wire& wire) {
    if (request[0] == kWrite) ++writes_;
    const Bytes nothing = {kAnswersNothing};
    for (bool more = true; more;) {
      const auto said = answers_.Next();
      more = said && (said->control & 1) != 0;
      // Always something: silence would be waited for.
      wire.Send(said && !said->bytes.empty() ? said->bytes : ByteView(nothing));
    }
  }

  fuzz::Parts answers_;
  uint32_t writes_ = 0;
  fuzz::LyingHandset lying_;
};

const test::TempFolder& Files() {
  static const test::TempFolder folder;
  return folder;
}

void LoadProgrammer(LyingLoader& loader) {
  constexpr const char* kProgrammer =
      ":020000040000FA\n:10000000000102030405060708090A0B0C0D0E0F78\n:0400000300000000F9\n:00000001FF\n";
  static const std::string file = Files().Add("programmer.hex", kProgrammer);
  uint8_t version = 0;
  uint32_t result = 0;
  KRAL_KOVA_NOP(loader.handle());
  KRAL_KOVA_SW_VERSION(loader.handle(), &version);
  const uint8_t loaded = KRAL_KOVA_LoadFlashProgrammer(loader.handle(), file.c_str(), 16, &result);
  Require((loaded == 1) == (result == KRAL_KOVA_LOADED));
  KRAL_KOVA_RESET(loader.handle());
}

void SetUp(LyingLoader& loader) {
  static const std::string table = Files().Add("table", std::string(40, 'p'));
  uint32_t block_size = 0;
  uint16_t window = 0;
  if (KRAL_STREAM_HELLO(loader.handle(), KRAL_STREAM_HELLO_VARIANT, &block_size, &window) == 1) Require(block_size > 0);
  KRAL_STREAM_SECURITY_MODE(loader.handle(), 1);
  uint8_t status = 0xEE;
  const uint8_t accepted = KRAL_STREAM_PARTITION_TABLE(loader.handle(), table.c_str(), 0, &status);
  Require((accepted == 1) == (status == KRAL_STREAM_PARTITION_ACCEPTED));
}

template <uint8_t Method>
void WriteImage(LyingLoader& loader) {
  const Bytes image(kImageSize, 0x5A);
  uint32_t result = 0;
  const uint8_t written = KRAL_STREAM_WriteImageMem(loader.handle(), image.data(), kImageSize, 0, 5, nullptr, 0, Method,
                                                    kBlock, 3, &result);
  Require((written == 1) == (result == KRAL_STREAM_WRITTEN));
  if (written == 1) Require(loader.writes() >= kImageSize / kBlock);
}

constexpr void (*kOperations[])(LyingLoader&) = {LoadProgrammer, SetUp, WriteImage<KRAL_STREAM_MULTI_IMAGE>,
                                                 WriteImage<KRAL_STREAM_NOR>};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 1) return 0;
  LyingLoader loader({data + 1, size - 1});
  kOperations[data[0] % std::size(kOperations)](loader);
  return 0;
}

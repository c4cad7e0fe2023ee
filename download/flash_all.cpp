// The steps of a download from cold, each of which has an export of its own, put together.
#include "download/flash_all.h"

#include <algorithm>
#include <exception>

#include "download/download_client.h"
#include "download/images/image_file.h"
#include "download/link/download_connection.h"
#include "download/link/download_failure.h"
#include "platform/file_util.h"

namespace kral::download {
namespace {

uint32_t Saturated(uint64_t value) {
  return static_cast<uint32_t>(std::min<uint64_t>(value, UINT32_MAX));
}

// While it lives, the downloads of a handset are parts of one whole to the caller: their progress is added up, and an
// abort that comes between two of them is not forgotten.
class WholeWay {
 public:
  WholeWay(Diag_FTM& phone, uint64_t total)
      : settings_(phone.state<Settings>()), handle_(phone.handle()), total_(total) {
    settings_.keep_abort = true;
    settings_.part_value = reinterpret_cast<uintptr_t>(this);
    settings_.part_callback = &WholeWay::OnPart;
  }
  ~WholeWay() {
    settings_.part_callback = nullptr;
    settings_.keep_abort = false;
  }
  WholeWay(const WholeWay&) = delete;
  WholeWay& operator=(const WholeWay&) = delete;

  void EndPart(uint64_t size) { before_ += size; }
  bool aborted() const { return settings_.abort; }

 private:
  static void KRAL_CALL OnPart(KRAL_HANDLE, uint32_t done, uint32_t, uintptr_t value) {
    const auto& self = *reinterpret_cast<const WholeWay*>(value);
    const auto callback = self.settings_.progress_callback.load();
    if (callback == nullptr) return;
    callback(self.handle_, Saturated(self.before_ + done), Saturated(self.total_), self.settings_.callback_value);
  }

  Settings& settings_;
  const KRAL_HANDLE handle_;
  const uint64_t total_;
  uint64_t before_ = 0;
};

// Nothing is sent to a handset for files that turn out useless half-way.
uint32_t CheckProgrammer(const char* file, uint64_t& size) {
  FileReader reader;
  if (reader.Open(file) || reader.size() == 0) {
    Fail(NotOpened(file));
    return KRAL_STREAM_FILE_NOT_OPENED;
  }
  size = reader.size();
  return KRAL_STREAM_WRITTEN;
}

uint32_t CheckImage(DataLogFileHandler& log, const char* file, uint64_t& size) {
  KRAL_IMAGE_INFO info{};
  try {
    images::HexLoss loss;
    const uint32_t result = images::GetImageInfo(file, KRAL_IMAGE_FORMAT_BY_CONTENT, info, &loss);
    if (result == KRAL_STREAM_DATA_LOST) images::LogLoss(log, file, loss);
    if (result != KRAL_STREAM_WRITTEN) return result;
  } catch (const std::exception&) {  // no memory or address space for it
    Fail(Failure(KRAL_ERROR_INTERNAL, "there is no memory for a look at %.200s", file));
    return KRAL_STREAM_FILE_NOT_DECODED;
  }
  size = info.size[0];
  if (info.size[1] == 0) return KRAL_STREAM_WRITTEN;
  Fail(FileFailure(file, "has a second region at 0x08000000, which would be left out"));
  return KRAL_STREAM_BAD_IMAGE;
}

bool BootTransfer(Diag_FTM& phone, const WholeWay& whole) {
  uint32_t version = 0;
  return kivrat::Connect(phone, version, nullptr, [&whole] { return whole.aborted(); });
}

template <class Source>
bool Serve(Diag_FTM& phone, const Source& source) {
  DownloadConnection connection(phone);
  connection.BeginWork();
  const auto progress = [&connection](uint64_t done, uint64_t total) {
    connection.Report(Saturated(done), Saturated(total));
    return !connection.aborted();
  };
  return kivrat::DownloadFlashProgrammer(phone, source, progress, [&connection] { return connection.aborted(); });
}

}  // namespace

bool ServeFlashProgrammer(Diag_FTM& phone, const char* file) {
  return Serve(phone, std::string(file));
}

bool ServeFlashProgrammer(Diag_FTM& phone, const kivrat::Programmer& programmer) {
  return Serve(phone, programmer);
}

FlashOutcome FlashAll(Diag_FTM& phone, const char* programmer, std::span<const char* const> images,
                      const uint8_t* types) {
  std::atomic<bool>& abort = phone.state<Settings>().abort;
  abort = false;  // here, so that one during the look at the files counts
  uint64_t programmer_size = 0;
  if (const uint32_t result = CheckProgrammer(programmer, programmer_size)) return {result};
  std::vector<uint64_t> sizes(images.size());
  uint64_t total = programmer_size;
  for (uint32_t i = 0; i < images.size(); ++i) {
    if (const uint32_t result = CheckImage(phone.log(), images[i], sizes[i])) return {result, i};
    total += sizes[i];
    if (abort) return {Aborted()};
  }

  WholeWay whole(phone, total);
  const auto failed = [&whole](uint32_t result, uint32_t image = KRAL_FLASH_NO_IMAGE) {
    return FlashOutcome{whole.aborted() ? Aborted() : result, image};
  };
  if (!BootTransfer(phone, whole)) return failed(KRAL_FLASH_CONNECT_FAILED);
  if (!ServeFlashProgrammer(phone, programmer)) {
    phone.GiveBackPort();
    return failed(KRAL_FLASH_PROGRAMMER_FAILED);
  }
  whole.EndPart(programmer_size);
  uint32_t block_size = 0;
  uint16_t window = 0;
  if (!StreamHello(phone, KRAL_STREAM_HELLO_VARIANT, &block_size, &window)) return failed(KRAL_FLASH_HELLO_FAILED);
  for (uint32_t i = 0; i < images.size(); ++i) {
    const uint8_t type = types == nullptr ? uint8_t{0} : types[i];
    uint32_t result = KRAL_STREAM_WRITTEN;
    const WriteArguments arguments{type, KRAL_STREAM_MULTI_IMAGE, block_size, window};
    if (whole.aborted() ||
        !WriteImageFile(phone, images[i], KRAL_IMAGE_FORMAT_BY_CONTENT, nullptr, arguments, &result)) {
      return failed(result, i);
    }
    whole.EndPart(sizes[i]);
  }
  return {};
}

}  // namespace kral::download

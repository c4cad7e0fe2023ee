// Exports that make pcapng files of captures, and captures of pcapng files.
#include <array>
#include <span>
#include <utility>

#include "base/failure.h"
#include "base/little_endian.h"
#include "base/outputs.h"
#include "frame/export_call.h"
#include "frame/version.h"
#include "kral/log.h"
#include "platform/file_util.h"
#include "transport/collection/capture_format.h"
#include "transport/trace/capture_conversion.h"

namespace {

using kral::AtomicFile;
using kral::Conversion;
using kral::ExportCall;
using kral::Fail;
using kral::FileFailure;
using kral::kNoFileName;

// From one file into another, which takes its name once it is whole.
template <class Convert>
bool ConvertFile(const char* from, const char* to, const char* foreign, Conversion& conversion, Convert convert) {
  auto source = kral::OpenCaptureSource(from);
  if (!source) return Fail(FileFailure(from, "cannot be read, or is being written"));
  // The source itself, by whatever name, and what a capture or trace writes at the time.
  if (kral::IsInUse(to)) return Fail(FileFailure(to, "is being read or written"));
  AtomicFile file;
  std::error_code error = file.Open(to);
  if (!error) {
    conversion = convert(std::move(source), [&](std::span<const uint8_t> bytes) {
      error = file.Write(bytes);
      return !error;
    });
    if (conversion.end == Conversion::End::kForeign) return Fail(FileFailure(from, foreign));
    if (!error && conversion.mark != 0) {
      std::array<uint8_t, sizeof(conversion.mark)> mark{};
      kral::StoreLe(std::span<uint8_t>(mark), 0, conversion.mark);
      error = file.Rewrite(kral::capture_head::kStepsBack, mark);
    }
    if (!error) error = file.Commit();
  }
  return !error || Fail(FileFailure(to, "cannot be written").System(error));
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_ExportCapture(const char* capture, const char* pcapng, uint64_t* packets, uint32_t* cut) {
  return ExportCall(__func__)
      .Require(capture != nullptr && pcapng != nullptr, kNoFileName)
      .Alone(uint8_t{0}, uint8_t{1}, [&]() -> uint8_t {
        Conversion conversion;
        const auto convert = [](kral::CaptureSource source, const kral::ConversionSink& write) {
          return kral::CaptureToPcapng(std::move(source), kral::LibraryVersion(), write);
        };
        if (!ConvertFile(capture, pcapng, "is not a capture file", conversion, convert)) return 0;
        kral::Put(packets, conversion.packets);
        kral::Put(cut, conversion.cut ? 1U : 0U);
        return 1;
      });
}

uint8_t KRAL_CALL KRAL_ImportCapture(const char* pcapng, const char* capture, uint64_t* packets, uint64_t* skipped,
                                     uint32_t* cut) {
  return ExportCall(__func__)
      .Require(pcapng != nullptr && capture != nullptr, kNoFileName)
      .Alone(uint8_t{0}, uint8_t{1}, [&]() -> uint8_t {
        Conversion conversion;
        if (!ConvertFile(pcapng, capture, "is not a pcapng file", conversion, kral::PcapngToCapture)) return 0;
        kral::Put(packets, conversion.packets);
        kral::Put(skipped, conversion.skipped);
        kral::Put(cut, conversion.cut ? 1U : 0U);
        return 1;
      });
}

}  // extern "C"

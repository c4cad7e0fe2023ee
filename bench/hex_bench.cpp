// Intel HEX decoding and encoding, beside srec_cat on the same 10 MiB file in the same run.
#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <random>
#include <string>
#include <vector>

#include "download/images/hex_phone_image_decoder.h"
#include "download/images/phone_image_dpaged.h"

namespace {

using namespace kral;

constexpr uint32_t kBase = 0x10000;
// A record of 16 bytes takes 44 characters: the text is a little over 10 MiB.
constexpr uint32_t kImageSize = 10 * 1024 * 1024 / 44 * 16 + 4096;
constexpr uint32_t kMaximumKib = 64 * 1024;

void FillImage(images::PhoneImage& image) {
  std::mt19937 random(7);
  std::vector<uint8_t> bytes(kImageSize);
  for (uint8_t& byte : bytes) byte = static_cast<uint8_t>(random());
  image.SetBaseAddress(kBase, 0);
  image.Write(kBase, bytes.data(), kImageSize, 0);
}

// The HEX file of the run, made once and removed at the end.
class HexFile {
 public:
  HexFile() : path_((std::filesystem::temp_directory_path() / "kral-bench.hex").string()) {
    images::PhoneImageDPaged image(kMaximumKib, nullptr);
    FillImage(image);
    images::HexPhoneImageDecoder encoder(false, false, true);
    images::TextFile file;
    if (!file.OpenForWriting(path_) || !encoder.Encode(image, file) || !file.Close()) std::abort();
    size_ = std::filesystem::file_size(path_);
  }
  ~HexFile() { std::remove(path_.c_str()); }
  HexFile(const HexFile&) = delete;
  HexFile& operator=(const HexFile&) = delete;

  static const HexFile& Instance() {
    static const HexFile file;
    return file;
  }
  const std::string& path() const { return path_; }
  uint64_t size() const { return size_; }

 private:
  std::string path_;
  uint64_t size_ = 0;
};

void Decode() {
  images::HexPhoneImageDecoder decoder;
  images::PhoneImageDPaged image(kMaximumKib, &decoder);
  images::TextFile file;
  if (!file.OpenForReading(HexFile::Instance().path()) || !decoder.Decode(image, file) ||
      image.GetSize(0) != kImageSize) {
    std::abort();
  }
}

double Seconds(std::chrono::steady_clock::time_point since) {
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - since).count();
}

void HexDecode(benchmark::State& state) {
  const auto bytes = static_cast<int64_t>(HexFile::Instance().size());
  for (auto _ : state) Decode();
  state.SetBytesProcessed(state.iterations() * bytes);
}
BENCHMARK(HexDecode)->Unit(benchmark::kMillisecond)->UseRealTime();

void HexEncode(benchmark::State& state) {
  images::PhoneImageDPaged image(kMaximumKib, nullptr);
  FillImage(image);
  images::HexPhoneImageDecoder encoder(false, false, true);
  int64_t bytes = 0;
  for (auto _ : state) {
    images::TextMemory text;
    if (!encoder.Encode(image, text)) std::abort();
    bytes += static_cast<int64_t>(text.text().size());
  }
  state.SetBytesProcessed(bytes);
}
BENCHMARK(HexEncode)->Unit(benchmark::kMillisecond)->UseRealTime();

// Each round runs srec_cat and the decoder once; `ratio` is how many times faster the decoder was. What srec_cat makes
// of the file goes nowhere.
void HexDecodeAgainstSrecCat(benchmark::State& state) {
  const std::string& path = HexFile::Instance().path();
  const std::string command = "srec_cat " + path + " -intel -o - -binary >/dev/null 2>&1";
  if (std::system(command.c_str()) != 0) {
    state.SkipWithError("srec_cat is missing");
    return;
  }
  double theirs = 0;
  double ours = 0;
  for (auto _ : state) {
    auto start = std::chrono::steady_clock::now();
    if (std::system(command.c_str()) != 0) std::abort();
    theirs += Seconds(start);
    start = std::chrono::steady_clock::now();
    Decode();
    ours += Seconds(start);
  }
  state.counters["srec_cat_ms"] = theirs * 1e3 / static_cast<double>(state.iterations());
  state.counters["kral_ms"] = ours * 1e3 / static_cast<double>(state.iterations());
  state.counters["ratio"] = theirs / ours;
}
BENCHMARK(HexDecodeAgainstSrecCat)->Unit(benchmark::kMillisecond)->UseRealTime()->Iterations(5);

}  // namespace

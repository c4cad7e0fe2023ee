// kral flash: what has the line of a handset in download, flash programmers, images.
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "tools/kral/flash/flash_images.h"
#include "tools/kral/flash/flash_many.h"
#include "tools/kral/flash/flash_target.h"
#include "tools/kral/format.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

// What one frame takes; the plan of a dry run reckons with it where nothing else is said.
constexpr std::uint32_t kLargestBlock = 16376;
constexpr std::uint32_t kDefaultPacket = 8178;
constexpr std::uint32_t kLargestChunk = 4089;
constexpr std::size_t kLargestOpening = 512;  // of headers and of partition tables

void PrintState(Context& context, std::uint16_t port, const char* state, const Json& more, const std::string& text) {
  Json members{{"port", port}, {"state", state}};
  members.update(more);
  context.out.Result(members, text);
}

void ShowInfo(Context& context) {
  FlashTarget target(context);
  const auto port = target.session().port();
  if (target.session().answers_diagnostics()) {
    return PrintState(context, port, "diagnostic", Json::object(),
                      "diagnostic mode: kral flash load FILE enters the loader\n");
  }
  // A loader refuses a hello at once, while a programmer is silent to a loader's request.
  if (const auto limits = target.TryHello(1)) {
    return PrintState(
        context, port, "programmer", {{"block_size", limits->block_size}, {"window", limits->window}},
        Format("flash programmer: blocks of {} bytes, window of {}\n", limits->block_size, limits->window));
  }
  if (const auto version = target.LoaderVersion()) {
    return PrintState(context, port, "loader", {{"version", *version}},
                      Format("loader, software version 0x{:02X}\n", *version));
  }
  throw ToolError(ExitCode::kNoAnswer, Format("nothing answers on {}", DescribePort(port)),
                  "neither a handset in diagnostic mode, nor a loader, nor a flash programmer has the line");
}

struct LoadArguments {
  std::string file;
  std::uint32_t packet = kDefaultPacket;
  bool dry_run = false;
};

void LoadProgrammer(Context& context, const LoadArguments& arguments) {
  const auto programmer = ReadProgrammer(arguments.file);
  if (arguments.dry_run) {
    const auto chunk = std::min(arguments.packet / 2, kLargestChunk);
    context.out.Result(
        {{"dry_run", true}, {"image", ImageObject(programmer)}, {"writes", CountBlocks(programmer, chunk)}},
        DescribeImage(programmer) +
            Format("  {} of at most {} bytes\n", Counted(CountBlocks(programmer, chunk), "write"), chunk));
    return;
  }
  FlashTarget target(context);
  target.EnterLoader();
  target.Load(programmer, arguments.packet);
  const auto limits = target.TryHello(5);
  if (!limits) {
    throw ToolError(ExitCode::kNoAnswer, Format("{} was started but does not answer", arguments.file),
                    "check that the programmer is meant for this handset");
  }
  context.out.Result(
      {{"port", target.session().port()},
       {"bytes", programmer.info.size[0]},
       {"block_size", limits->block_size},
       {"window", limits->window}},
      Format("{} is running: blocks of {} bytes, window of {}\n", arguments.file, limits->block_size, limits->window));
}

struct WriteArguments {
  std::vector<std::string> images;
  std::string format = "auto";
  WriteOptions options;
  std::optional<std::uint8_t> security_mode;
  std::string partition_table;
  bool override_table = false;
  bool dry_run = false;
  bool reset = false;
};

void PrintPlan(Context& context, const std::vector<FlashImage>& images, std::uint32_t block_size) {
  Json rows = Json::array();
  std::string text;
  std::uint64_t blocks = 0;
  for (const auto& image : images) {
    const auto count = CountBlocks(image, block_size);
    auto row = ImageObject(image);
    row["blocks"] = count;
    rows.push_back(std::move(row));
    text += DescribeImage(image) + Format("  {} of at most {} bytes\n", Counted(count, "block"), block_size);
    blocks += count;
  }
  const auto bytes = TotalBytes(images);
  text += Format("in all {} in {}; nothing was written\n", Counted(bytes, "byte"), Counted(blocks, "block"));
  context.out.Result(
      {{"dry_run", true}, {"images", rows}, {"bytes", bytes}, {"blocks", blocks}, {"block_size", block_size}}, text);
}

void WriteToMany(Context& context, const WriteArguments& arguments) {
  if (arguments.security_mode) {
    throw ToolError(ExitCode::kUsage, "a security mode is set on one handset at a time", "name one port: -p 7");
  }
  FlashPlan plan;
  plan.partition_table = arguments.partition_table;
  plan.override_table = arguments.override_table;
  plan.images = arguments.images;
  plan.options = arguments.options;
  plan.reset = arguments.reset;
  FlashMany(context, plan);
}

// Every file is looked at before the first byte goes out.
void WriteImages(Context& context, WriteArguments arguments) {
  auto& options = arguments.options;
  options.format = ParseImageFormat(arguments.format);
  if (!options.header.empty()) CheckFile(options.header, kLargestOpening);
  if (!arguments.partition_table.empty()) CheckFile(arguments.partition_table, kLargestOpening);
  if (context.for_several() && !arguments.dry_run) return WriteToMany(context, arguments);
  std::vector<FlashImage> images;
  for (const auto& argument : arguments.images) images.push_back(ReadFlashImage(argument, options.format));
  if (arguments.dry_run)
    return PrintPlan(context, images, options.block_size == 0 ? kLargestBlock : options.block_size);

  FlashTarget target(context);
  const auto limits = target.Hello();
  if (arguments.security_mode) target.SetSecurityMode(*arguments.security_mode);
  if (!arguments.partition_table.empty())
    target.SendPartitionTable(arguments.partition_table, arguments.override_table);
  const auto total = TotalBytes(images);
  std::uint64_t done = 0;
  Json written = Json::array();
  {
    Progress progress(context.out, "write", total);
    for (const auto& image : images) {
      target.Write(image, options, limits, done, progress);
      done += image.info.size[0];
      written.push_back(ImageObject(image));
      context.found["written"] = written;
    }
  }
  if (arguments.reset) target.Reset();
  context.out.Result(
      {{"port", target.session().port()}, {"written", written}, {"bytes", done}, {"reset", arguments.reset}},
      Format("{} in {} written and acknowledged\n", Counted(done, "byte"), Counted(images.size(), "image")));
}

void RestartHandset(Context& context) {
  FlashTarget target(context);
  const auto port = target.session().port();
  if (target.session().answers_diagnostics()) {
    throw ToolError(ExitCode::kRefused, Format("the handset on {} is in diagnostic mode", DescribePort(port)),
                    "kral mode reset restarts it from there");
  }
  target.Reset();
  context.out.Result({{"port", port}}, "restarted\n");
}

void VerifyImages(Context& context, const std::vector<std::string>& files, const std::string& format) {
  Json rows = Json::array();
  std::string text;
  for (const auto& file : files) {
    const auto image = ReadFlashImage(file, ParseImageFormat(format));
    rows.push_back(ImageObject(image));
    context.found["images"] = rows;
    text += DescribeImage(image);
  }
  context.out.Result({{"images", rows}}, text);
}

struct HexArguments {
  std::string input;
  std::string output;
  std::optional<std::uint32_t> base;
};

void Convert(Context& context, const HexArguments& arguments) {
  const auto image = ReadFlashImage(arguments.input, KRAL_IMAGE_FORMAT_BY_CONTENT);
  const bool to_binary = image.info.format == KRAL_IMAGE_FORMAT_HEX;
  if (to_binary && arguments.base) {
    throw ToolError(ExitCode::kUsage, "a HEX file tells its base itself", "--base is for binary files");
  }
  std::uint32_t base = arguments.base.value_or(0);
  std::uint32_t result = 0;
  if (KRAL_HEX_Convert(image.file.c_str(), arguments.output.c_str(),
                       to_binary ? KRAL_HEX_TO_BINARY : KRAL_HEX_FROM_BINARY, &base, &result) == 0) {
    if (result == KRAL_STREAM_BAD_ARGUMENT) {
      throw ToolError(ExitCode::kUsage, Format("the base 0x{:X} is no multiple of 0x10000", base),
                      "give a base such as --base 0x20000");
    }
    if (result == KRAL_STREAM_PAST_END) {
      throw ToolError(ExitCode::kUsage,
                      Format("{} bytes from 0x{:X} on go past address 0xFFFFFFFF", image.info.size[0], base),
                      "give a lower base");
    }
    if (result != KRAL_HEX_NOT_WRITTEN) {
      throw ToolError(ExitCode::kBadFile, Format("{} changed while it was read", arguments.input),
                      "wait until it is complete");
    }
    throw ToolError(ExitCode::kBadFile, Format("{} cannot be written", arguments.output),
                    "check folder, permissions and room on the disk");
  }
  context.out.Result({{"output", arguments.output}, {"base", base}, {"bytes", image.info.size[0]}},
                     Format("{}: {} bytes from 0x{:08X}\n", arguments.output, image.info.size[0], base));
}

void AddFormat(const Command& verb, std::string& format) {
  verb.Add("--format", format, "Format of the images: auto goes by a colon as the first character")
      .OneOf({"auto", "hex", "bin"})
      .ShowDefault();
}

void AddLoadVerb(const Command& flash, Context& context) {
  const auto arguments = std::make_shared<LoadArguments>();
  const auto load = flash.Verb("load", "Enter the loader, load a flash programmer and start it");
  load.Add("programmer", arguments->file, "Intel HEX file of the flash programmer").Required();
  load.Add("--packet", arguments->packet, "Largest packet of the loader, bytes; half of it is data")
      .Between(2, 65535, "bytes")
      .ShowDefault();
  load.Flag("--dry-run", arguments->dry_run, "Check the file and print the plan, without a handset");
  load.AsksNobody([arguments] { return arguments->dry_run; });
  load.Reads([arguments] { return std::vector<std::string>{arguments->file}; });
  load.ForMany();
  load.Run([&context, arguments] { LoadProgrammer(context, *arguments); });
}

void AddWriteVerb(const Command& flash, Context& context) {
  const auto arguments = std::make_shared<WriteArguments>();
  const auto write = flash.Verb("write", "Write images through the flash programmer");
  write.Add("images", arguments->images, "Image files, each as FILE or TYPE:FILE").Required();
  AddFormat(write, arguments->format);
  write.Add("--type", arguments->options.type, "Image type of files that do not name their own");
  write.Add("--header", arguments->options.header, "File of at most 512 bytes that opens each image");
  write.Flag("--nor", arguments->options.nor, "Neither open nor close: for programmers that take one image");
  write.Add("--block-size", arguments->options.block_size, "Bytes per write at most; default: the handset's")
      .Between(1, kLargestBlock, "bytes");
  write.Add("--security", arguments->security_mode, "Set this security mode first");
  write.Add("--partition", arguments->partition_table, "Send this partition table first");
  write.Flag("--override", arguments->override_table, "Let the partition table replace a different one");
  write.Flag("--reset", arguments->reset, "Restart the handset afterwards");
  write.AsksNobody([arguments] { return arguments->dry_run; });
  write.Flag("--dry-run", arguments->dry_run, "Check the files and print the plan, without a handset");
  write.ForMany();
  write.TakesPorts();
  write.Run([&context, arguments] { WriteImages(context, *arguments); });
}

}  // namespace

void AddFlashVerbs(const Command& root, Context& context) {
  const auto flash = root.Noun("flash", "Software download: flash programmers and images");
  const auto info = flash.Verb("info", "Tell what has the line: diagnostics, loader or flash programmer");
  info.ForMany(Command::InDownload::kMayBeAsked);
  info.Run([&context] { ShowInfo(context); });
  AddLoadVerb(flash, context);
  AddWriteVerb(flash, context);

  const auto reset = flash.Verb("reset", "Restart a handset out of its loader or flash programmer");
  reset.ForMany(Command::InDownload::kMayBeAsked);
  reset.Run([&context] { RestartHandset(context); });

  const auto files = std::make_shared<std::vector<std::string>>();
  const auto format = std::make_shared<std::string>("auto");
  const auto verify = flash.Verb("verify-image", "Check image files and tell what is in them; needs no handset");
  verify.NeedsNoHandset();
  verify.Add("images", *files, "Image files").Required();
  AddFormat(verify, *format);
  verify.Run([&context, files, format] { VerifyImages(context, *files, *format); });

  const auto arguments = std::make_shared<HexArguments>();
  const auto hex = flash.Verb("hex", "Convert Intel HEX to binary, or a binary to Intel HEX; needs no handset");
  hex.NeedsNoHandset();
  hex.Add("input", arguments->input, "File to read: the other format is written").Required();
  hex.Add("output", arguments->output, "File to write").Required();
  hex.Writes([arguments] { return std::vector<std::string>{arguments->output}; });
  hex.Add("--base", arguments->base, "First address of a binary; a multiple of 0x10000");
  hex.Run([&context, arguments] { Convert(context, *arguments); });
}

}  // namespace kral::tool

// Opens the files of a job before any handset hears of it. The readers are those of the single downloads and backups.
#include "station/job_files.h"

#include "base/failure.h"
#include "base/text_log.h"
#include "download/download_client.h"
#include "download/images/phone_image_binary.h"
#include "download/link/download_failure.h"
#include "download/stream/image_set_up.h"
#include "download/stream/stream_format.h"
#include "kral/ventrims.h"
#include "storage/backup/pkv_jobs.h"

namespace kral::station {
namespace {

Failure HeaderTooLong(const std::string& file, uint32_t size) {
  const std::string what =
      "has " + std::to_string(size) + " bytes: a header takes " + std::to_string(stream::kLongestHeader) + " at most";
  return FileFailure(file, what.c_str());
}

}  // namespace

bool JobFiles::Open(Step& step) try {
  switch (step.kind) {
    case StepKind::kProgrammer:
      return step.number == KRAL_VENTRIMS_PROGRAMMER_HEX ? OpenHex(step) : OpenBoot(step);
    case StepKind::kPartitionTable:
      return OpenTable(step);
    case StepKind::kImage:
      return OpenImage(step);
    case StepKind::kRestore:
    case StepKind::kVerify:
      return OpenSet(step);
    default:
      return true;
  }
} catch (const images::PhoneImageException&) {
  return Fail(FileFailure(step.file, "became shorter while it was read"));
} catch (const std::exception&) {  // no memory, or no address space for an image
  return Fail(Failure(KRAL_ERROR_INTERNAL, "there is no memory for the file %.200s", step.file.c_str()));
}

bool JobFiles::OpenBoot(Step& step) {
  auto file = std::make_shared<images::PhoneImageBinary>();
  if (!file->Open(step.file)) {
    return Fail(file->too_large() ? FileFailure(step.file, "has 4 GiB or more, or more than this process can map")
                                  : download::NotOpened(step.file));
  }
  file->KeepInMemory();
  step.bytes = file->GetTotalSize();
  step.boot = std::move(file);
  return true;
}

bool JobFiles::OpenHex(Step& step) {
  auto file = std::make_shared<kova::ProgrammerFile>();
  if (file->Open(step.file) != KRAL_KOVA_LOADED) return false;
  step.bytes = file->image().GetSize(0);
  step.hex = std::move(file);
  return true;
}

bool JobFiles::OpenTable(Step& step) {
  auto table = std::make_shared<std::vector<uint8_t>>();
  if (!stream::ReadPartitionTable(NullLog(), step.file, *table)) return false;
  if (table->empty()) return Fail(FileFailure(step.file, "is empty: it is no partition table"));
  step.table = std::move(table);
  return true;
}

bool JobFiles::OpenImage(Step& step) {
  const std::string key =
      std::to_string(step.number) + (step.has_header ? '+' + step.header_file : "") + '\0' + step.file;
  std::shared_ptr<const OpenedImage>& known = images_[key];
  if (!known) {
    auto opened = std::make_shared<OpenedImage>();
    opened->has_header = step.has_header;
    const char* const header = step.has_header ? step.header_file.c_str() : nullptr;
    if (download::OpenImage(step.file.c_str(), step.number, header, opened->image, opened->header) !=
        KRAL_STREAM_WRITTEN) {
      return false;
    }
    if (const uint32_t size = step.has_header ? opened->header.image().GetSize(0) : 0; size > stream::kLongestHeader)
      return Fail(HeaderTooLong(step.header_file, size));
    if (opened->image.image().GetSize(0) == 0) return Fail(FileFailure(step.file, "holds no data"));
    opened->image.KeepInMemory();
    known = std::move(opened);
  }
  step.bytes = known->image.image().GetSize(0);
  step.image = known;
  return true;
}

bool JobFiles::OpenSet(Step& step) {
  std::shared_ptr<const pkv::PkvSet>& known = sets_[step.file];
  if (!known) {
    auto set = std::make_shared<pkv::PkvSet>();
    if (backup::ReadSet(NullLog(), step.file, *set) != KRAL_PKV_STATUS_DONE) return false;
    known = std::move(set);
  }
  step.set = known;
  return true;
}

}  // namespace kral::station

// The files of a capture that goes on for days: numbered, and only the latest are kept.
#ifndef KRAL_TRANSPORT_COLLECTION_CAPTURE_SERIES_H
#define KRAL_TRANSPORT_COLLECTION_CAPTURE_SERIES_H

#include <cstdint>
#include <functional>
#include <string>

#include "transport/collection/batch_writer.h"

namespace kral {

// Opens another file with every call: for "night.cap" the files "night-00001.cap", "night-00002.cap" and so on behind
// the last that is there, so that none of a former capture is written over, nor one of another that runs. Once a file
// has begun, the oldest are removed until `keep` with it are left, those of former captures too; 0: none are.
std::function<CaptureSink()> CaptureSeries(const std::string& path, uint32_t keep);

}  // namespace kral

#endif

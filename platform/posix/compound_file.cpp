// Writes compound documents on Linux, by libgsf.
#include "platform/compound_file.h"

#include <gsf/gsf-outfile-msole.h>
#include <gsf/gsf-outfile.h>
#include <gsf/gsf-output-memory.h>

#include <memory>

namespace kral {
namespace {

struct Unreference {
  void operator()(void* object) const { g_object_unref(object); }
};
template <class T>
using Owned = std::unique_ptr<T, Unreference>;

// A child must be closed before the next one of its parent is begun.
bool WriteStream(GsfOutfile* parent, const CompoundStream& stream) {
  const Owned<GsfOutput> output(gsf_outfile_new_child(parent, stream.name.c_str(), FALSE));
  if (!output) return false;
  const bool written = stream.bytes.empty() || gsf_output_write(output.get(), stream.bytes.size(), stream.bytes.data());
  return gsf_output_close(output.get()) && written;
}

// libgsf keeps siblings sorted and looks for the place of each from the front: the last name first is the short way.
bool WriteChildren(GsfOutfile* outfile, const CompoundStorage& storage) {
  for (auto stream = storage.streams.rbegin(); stream != storage.streams.rend(); ++stream) {
    if (!WriteStream(outfile, *stream)) return false;
  }
  for (auto child = storage.storages.rbegin(); child != storage.storages.rend(); ++child) {
    const Owned<GsfOutput> output(gsf_outfile_new_child(outfile, child->name.c_str(), TRUE));
    if (!output) return false;
    const bool written = WriteChildren(GSF_OUTFILE(output.get()), *child);
    if (!gsf_output_close(output.get()) || !written) return false;
  }
  return true;
}

}  // namespace

std::string SerializeCompoundFile(const CompoundStorage& root, std::vector<uint8_t>& file) {
  const Owned<GsfOutput> memory(gsf_output_memory_new());
  const Owned<GsfOutfile> outfile(gsf_outfile_msole_new(memory.get()));
  if (!outfile) return "out of memory";
  const bool written = WriteChildren(outfile.get(), root);
  if (!gsf_output_close(GSF_OUTPUT(outfile.get())) || !written) return "the compound document cannot be made";
  const uint8_t* bytes = gsf_output_memory_get_bytes(GSF_OUTPUT_MEMORY(memory.get()));
  const auto size = static_cast<size_t>(gsf_output_size(memory.get()));
  if (bytes == nullptr) return "the compound document is empty";
  file.assign(bytes, bytes + size);
  return {};
}

}  // namespace kral

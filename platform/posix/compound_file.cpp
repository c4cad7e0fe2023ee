// Compound documents on Linux, by libgsf.
#include "platform/compound_file.h"

#include <gsf/gsf-infile-msole.h>
#include <gsf/gsf-infile.h>
#include <gsf/gsf-input-memory.h>
#include <gsf/gsf-outfile-msole.h>
#include <gsf/gsf-outfile.h>
#include <gsf/gsf-output-memory.h>

#include <memory>
#include <utility>

#include "platform/compound_chains.h"

namespace kral {
namespace {

struct Unreference {
  void operator()(void* object) const { g_object_unref(object); }
};
template <class T>
using Owned = std::unique_ptr<T, Unreference>;

// Damaged files are expected here and told by the result: libgsf's warnings about them must not reach the host's
// standard error meanwhile.
class QuietParser {
 public:
  QuietParser() : handler_(g_log_set_handler(kDomain, G_LOG_LEVEL_MASK, Swallow, nullptr)) {}
  ~QuietParser() { g_log_remove_handler(kDomain, handler_); }
  QuietParser(const QuietParser&) = delete;
  QuietParser& operator=(const QuietParser&) = delete;

 private:
  static constexpr const char* kDomain = "libgsf:msole";
  static void Swallow(const gchar*, GLogLevelFlags, const gchar*, gpointer) {}
  guint handler_;
};

std::string TakeMessage(GError* error, const char* otherwise) {
  std::string text = error != nullptr ? error->message : otherwise;
  g_clear_error(&error);
  return text;
}

// Walks a storage; gives the reason why the walk had to stop, or an empty text.
class Reader {
 public:
  std::string Read(GsfInfile* infile, CompoundStorage& storage, size_t depth) {
    if (depth > kCompoundDepthLimit) return "storages nested too deeply";
    const int children = gsf_infile_num_children(infile);
    for (int i = 0; i < children; ++i) {
      if (++entries_ > kCompoundEntryLimit) return "too many entries";
      const Owned<GsfInput> child(gsf_infile_child_by_index(infile, i));
      if (!child) return "an entry cannot be opened";
      const char* name = gsf_input_name(child.get());
      std::string problem = IsStorage(child.get()) ? Read(GSF_INFILE(child.get()), AddStorage(storage, name), depth + 1)
                                                   : ReadStream(child.get(), AddStream(storage, name));
      if (!problem.empty()) return problem;
    }
    return {};
  }

 private:
  // libgsf opens both kinds as infiles; only a storage has children, an empty one reports 0 of them, a stream -1.
  static bool IsStorage(GsfInput* child) {
    return GSF_IS_INFILE(child) && gsf_infile_num_children(GSF_INFILE(child)) >= 0;
  }

  static CompoundStorage& AddStorage(CompoundStorage& parent, const char* name) {
    CompoundStorage& storage = parent.storages.emplace_back();
    storage.name = name != nullptr ? name : "";
    return storage;
  }

  static CompoundStream& AddStream(CompoundStorage& parent, const char* name) {
    CompoundStream& stream = parent.streams.emplace_back();
    stream.name = name != nullptr ? name : "";
    return stream;
  }

  std::string ReadStream(GsfInput* input, CompoundStream& stream) {
    const gsf_off_t size = gsf_input_size(input);
    if (size < 0 || static_cast<uint64_t>(size) > kCompoundFileLimit - bytes_) return "a stream is too large";
    bytes_ += static_cast<size_t>(size);
    stream.bytes.resize(static_cast<size_t>(size));
    if (size == 0) return {};
    if (gsf_input_seek(input, 0, G_SEEK_SET) ||
        gsf_input_read(input, static_cast<size_t>(size), stream.bytes.data()) == nullptr) {
      return "stream " + stream.name + " is cut short";
    }
    return {};
  }

  size_t entries_ = 0;
  size_t bytes_ = 0;
};

// A child must be closed before the next one of its parent is begun.
bool WriteStream(GsfOutfile* parent, const CompoundStream& stream) {
  const Owned<GsfOutput> output(gsf_outfile_new_child(parent, stream.name.c_str(), FALSE));
  if (!output) return false;
  const bool written = stream.bytes.empty() || gsf_output_write(output.get(), stream.bytes.size(), stream.bytes.data());
  return gsf_output_close(output.get()) && written;
}

bool WriteChildren(GsfOutfile* outfile, const CompoundStorage& storage) {
  for (const CompoundStream& stream : storage.streams) {
    if (!WriteStream(outfile, stream)) return false;
  }
  for (const CompoundStorage& child : storage.storages) {
    const Owned<GsfOutput> output(gsf_outfile_new_child(outfile, child.name.c_str(), TRUE));
    if (!output) return false;
    const bool written = WriteChildren(GSF_OUTFILE(output.get()), child);
    if (!gsf_output_close(output.get()) || !written) return false;
  }
  return true;
}

}  // namespace

std::string ParseCompoundFile(std::span<const uint8_t> file, CompoundStorage& root) {
  if (!CompoundChainsEnd(file)) return "a compound document whose chains do not end";
  const Owned<GsfInput> input(gsf_input_memory_new(file.data(), static_cast<gsf_off_t>(file.size()), FALSE));
  if (!input) return "out of memory";
  const QuietParser quiet;
  GError* error = nullptr;
  const Owned<GsfInfile> infile(gsf_infile_msole_new(input.get(), &error));
  if (!infile) return TakeMessage(error, "not a compound document");
  CompoundStorage tree;
  std::string problem = Reader().Read(infile.get(), tree, 0);
  if (problem.empty()) root = std::move(tree);
  return problem;
}

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

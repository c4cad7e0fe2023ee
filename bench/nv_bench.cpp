// Loading definition files of the NV tool: time over the number of items must grow linearly.
#include <benchmark/benchmark.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

#include "storage/nv/nv_definition_xml.h"

namespace {

using namespace kral::nv;

// Items of several members each, half of them of shared types, as real files have them.
std::string MakeFile(size_t items) {
  const std::string path = (std::filesystem::temp_directory_path() / "kral-bench-nv.xml").string();
  std::ofstream file(path, std::ios::binary);
  file << "<NvDefinition><DataType name=\"Curve\"><Member name=\"band\" typeid=\"word8\"/><Member name=\"level\" "
          "typeid=\"word16\" signed=\"1\" num_of_element=\"16\"/></DataType>\n";
  for (size_t i = 0; i < items; ++i) {
    file << "<NvItem id=\"" << i % 65536 << "\" name=\"ITEM_OF_THE_BENCH_" << i << '"';
    if (i % 2 == 0) {
      file << " typeid=\"Curve\"/>\n";
    } else {
      file << "><DataType><Member name=\"nam\" typeid=\"word8\"/><Member name=\"mode\" typeid=\"word16\"/>"
              "<Member name=\"digits\" typeid=\"word8\" num_of_element=\"12\"/></DataType></NvItem>\n";
    }
  }
  file << "</NvDefinition>\n";
  return path;
}

void LoadNvDefinitions(benchmark::State& state) {
  const auto items = static_cast<size_t>(state.range(0));
  const std::string path = MakeFile(items);
  for (auto _ : state) {
    NvDefinitions definitions;
    NvDefinitionFile file;
    std::string problem;
    if (LoadDefinitionFile(path, NvDefinitionKind::kDefinitions, definitions, file, problem) != NvError::kNone) {
      std::abort();
    }
    for (NvItem& item : file.items) definitions.Put(std::move(item));
    if (definitions.count() != items) std::abort();
  }
  std::remove(path.c_str());
  state.SetItemsProcessed(state.iterations() * static_cast<int64_t>(items));
  state.SetComplexityN(static_cast<int64_t>(items));
}
BENCHMARK(LoadNvDefinitions)
    ->Arg(1250)
    ->Arg(2500)
    ->Arg(5000)
    ->Arg(10000)
    ->Arg(20000)
    ->Unit(benchmark::kMillisecond)
    ->Complexity(benchmark::oN);

}  // namespace

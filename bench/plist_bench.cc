// Property-list encodings at several sizes. Reading XML is shown next to a bare parse of the same
// bytes, so that their bytes_per_second can be compared.
#include <benchmark/benchmark.h>
#include <expat.h>
#include <string>

#include "base/format.h"
#include "platform/plist/binary.h"
#include "platform/plist/xml.h"

namespace {

using namespace tavrel;

// Resembles a tallied log and a preference domain: keys with integers, and now and then a
// small dictionary or array.
plist::Value document(std::int64_t keys) {
  plist::Dictionary document;
  for (std::int64_t i = 0; i < keys; ++i) {
    const std::string key = format("com.example.subsystem.counter.%lld", i);
    if (i % 10 == 0) {
      document.set(key, plist::Dictionary{{"count", i},
                                          {"mean", static_cast<double>(i) / 7},
                                          {"name", format("entry %lld", i)}});
    } else if (i % 10 == 5) {
      document.set(key, plist::Array{i, i * 2, i * 3, i * 4});
    } else {
      document.set(key, i * 1000);
    }
  }
  return document;
}

void setThroughput(benchmark::State& state, std::size_t bytes) {
  state.SetBytesProcessed(static_cast<std::int64_t>(bytes) * state.iterations());
  state.SetItemsProcessed(state.range(0) * state.iterations());
}

void bareXmlParse(benchmark::State& state) {
  const std::string xml = *plist::writeXml(document(state.range(0)));
  for (auto _ : state) {
    XML_Parser parser = XML_ParserCreate(nullptr);
    XML_SetElementHandler(
        parser, [](void*, const XML_Char*, const XML_Char**) {}, [](void*, const XML_Char*) {});
    XML_SetCharacterDataHandler(parser, [](void*, const XML_Char*, int) {});
    benchmark::DoNotOptimize(XML_Parse(parser, xml.data(), static_cast<int>(xml.size()), XML_TRUE));
    XML_ParserFree(parser);
  }
  setThroughput(state, xml.size());
}

template <auto write, auto read>
void reading(benchmark::State& state) {
  const std::string encoded = *write(document(state.range(0)));
  for (auto _ : state) {
    benchmark::DoNotOptimize(read(asBytes(encoded)));
  }
  setThroughput(state, encoded.size());
}

template <auto write>
void writing(benchmark::State& state) {
  const plist::Value value = document(state.range(0));
  std::size_t bytes = 0;
  for (auto _ : state) {
    bytes = write(value)->size();
  }
  setThroughput(state, bytes);
}

void sizes(benchmark::internal::Benchmark* benchmark) {
  benchmark->Arg(100)->Arg(3'000)->Arg(100'000);
}

BENCHMARK(bareXmlParse)->Apply(sizes);
BENCHMARK(reading<plist::writeXml, plist::readXml>)->Name("readXml")->Apply(sizes);
BENCHMARK(writing<plist::writeXml>)->Name("writeXml")->Apply(sizes);
BENCHMARK(reading<plist::writeBinary, plist::readBinary>)->Name("readBinary")->Apply(sizes);
BENCHMARK(writing<plist::writeBinary>)->Name("writeBinary")->Apply(sizes);

}  // namespace

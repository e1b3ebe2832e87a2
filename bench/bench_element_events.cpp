// The element events while the user draws: a realize relation from a
// coclass to an interface that ten coclasses of ten ATL object classes each
// realize, and the search for an interface's ATL object classes as the
// classes around it grow. Every host call is a round trip in the real host,
// so the count per event is reported beside the time; both must grow
// linearly with the classes reached.
#include <benchmark/benchmark.h>

#include <string>

#include "automation/collection.h"
#include "model/shared_modelutilities.h"
#include "sim_host.h"

namespace kpx::bench {
namespace {

// An interface realized by `coclasses` VC++ coclasses, each with
// `atlObjects` ATL object classes; the ATL assistant records its calls.
std::string AtlModel(int coclasses, int atlObjects) {
  std::string e = R"({"kind": "Class", "name": "IShape", "stereotype": "interface", "language": "VC++"})";
  for (int c = 0; c < coclasses; ++c) {
    const std::string co = "Co" + std::to_string(c);
    e += R"(, {"kind": "Class", "name": ")" + co + R"(", "stereotype": "coclass", "language": "VC++"})";
    e += R"(, {"kind": "RealizeRelation", "name": ")" + co + R"(->IShape", "client": ")" + co +
         R"(", "supplier": "IShape"})";
    for (int a = 0; a < atlObjects; ++a) {
      const std::string obj = "C" + co + "Obj" + std::to_string(a);
      e += R"(, {"kind": "Class", "name": ")" + obj + R"(", "stereotype": "atlobject", "language": "VC++"})";
      e += R"(, {"kind": "DependencyRelation", "name": ")" + obj + R"(->)" + co + R"(", "client": ")" + obj +
           R"(", "supplier": ")" + co + R"("})";
    }
  }
  return R"({"addins": [{"name": "VC++"}],
             "companions": [{"progid": "kpxatlassist.kpxatlAPI", "members": {"ImplementInterface": {}}}],
             "model": {"properties": {"VC++": {"Scripting": "False"}}, "elements": [)" +
         e + "]}}";
}

void BM_NewRealizeRelation(benchmark::State& state) {
  SimHost host(AtlModel(10, 10));
  const ObjectPtr app = host.app();
  const ObjectPtr relation = host.element("Co0->IShape");
  host.api().OnNewModelElement(app, relation);  // settings and assistant, once
  const uint64_t before = host.hostCalls();
  int64_t events = 0;
  for (auto _ : state) {
    host.api().OnNewModelElement(app, relation);
    host.DropEvents();
    ++events;
  }
  state.counters["hostCalls"] = static_cast<double>(host.hostCalls() - before) / static_cast<double>(events);
}
BENCHMARK(BM_NewRealizeRelation)->Unit(benchmark::kMicrosecond);

void BM_FindAtlObjectClasses(benchmark::State& state) {
  const int related = static_cast<int>(state.range(0));
  SimHost host(AtlModel(related, 1));
  const ObjectPtr shape = host.element("IShape");
  const auto result = std::make_shared<Collection>();
  const uint64_t before = host.hostCalls();
  int64_t runs = 0;
  for (auto _ : state) {
    FindAtlObjectClasses(shape, result);
    host.DropEvents();
    ++runs;
  }
  state.counters["hostCalls"] = static_cast<double>(host.hostCalls() - before) / static_cast<double>(runs);
  state.counters["found"] = static_cast<double>(result->size());
  state.SetComplexityN(related);
}
BENCHMARK(BM_FindAtlObjectClasses)->Arg(10)->Arg(100)->Arg(1000)->Unit(benchmark::kMicrosecond)->Complexity();

}  // namespace
}  // namespace kpx::bench

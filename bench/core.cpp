// Core primitives beside the standard library, in one run:
// - lock cycles (start and stop, nothing in between) of KXCRWLock and
//   std::shared_mutex, reads and writes, on one thread and contended by 2
//   and 4 threads (aggregate cycles per second, wall-clock time);
// - container operations on 1000 sparse integer keys: set (replace), get,
//   has (half the keys missing) and enumerate, for KXCSparseObjectArray
//   (plain and safed), KXCDictionaryWithIntKeys and KXCIntegerMapTable beside
//   std::unordered_map and std::map doing the same work (gets copy the
//   shared_ptr, as ours return one).
// The ratios at the end are ours over the standard peer; above 1 is faster.
//
//   kxacore_bench_core --benchmark_min_time=0.2

#include <benchmark/benchmark.h>

#include "bench/KXABenchReporter.h"

#include <cstdint>
#include <cstdio>
#include <map>
#include <memory>
#include <shared_mutex>
#include <string>
#include <unordered_map>
#include <vector>

#include "kxacore/Core/KXCDictionaryWithIntKeys.h"
#include "kxacore/Core/KXCIntegerMapTable.h"
#include "kxacore/Core/KXCRWLock.h"
#include "kxacore/Core/KXCSparseObjectArray.h"

namespace {

// --- Locks -----------------------------------------------------------------

// One lock per benchmark, shared by its threads.
template <typename Lock>
Lock& sharedLock() {
  static Lock lock;
  return lock;
}

void readCycle(KXCRWLock& lock) {
  lock.startRead();
  lock.stopRead();
}
void readCycle(std::shared_mutex& lock) {
  lock.lock_shared();
  lock.unlock_shared();
}
void writeCycle(KXCRWLock& lock) {
  lock.startWrite();
  lock.stopWrite();
}
void writeCycle(std::shared_mutex& lock) {
  lock.lock();
  lock.unlock();
}

template <typename Lock>
void BM_ReadCycle(benchmark::State& state) {
  Lock& lock = sharedLock<Lock>();
  for (auto _ : state) readCycle(lock);
  state.SetItemsProcessed(state.iterations());
}

template <typename Lock>
void BM_WriteCycle(benchmark::State& state) {
  Lock& lock = sharedLock<Lock>();
  for (auto _ : state) writeCycle(lock);
  state.SetItemsProcessed(state.iterations());
}

BENCHMARK(BM_ReadCycle<KXCRWLock>)->Name("RWLockRead");
BENCHMARK(BM_ReadCycle<std::shared_mutex>)->Name("SharedMutexRead");
BENCHMARK(BM_WriteCycle<KXCRWLock>)->Name("RWLockWrite");
BENCHMARK(BM_WriteCycle<std::shared_mutex>)->Name("SharedMutexWrite");
BENCHMARK(BM_ReadCycle<KXCRWLock>)->Name("RWLockRead")->Threads(2)->Threads(4)->UseRealTime();
BENCHMARK(BM_ReadCycle<std::shared_mutex>)->Name("SharedMutexRead")->Threads(2)->Threads(4)->UseRealTime();
BENCHMARK(BM_WriteCycle<KXCRWLock>)->Name("RWLockWrite")->Threads(2)->Threads(4)->UseRealTime();
BENCHMARK(BM_WriteCycle<std::shared_mutex>)->Name("SharedMutexWrite")->Threads(2)->Threads(4)->UseRealTime();

// --- Containers ------------------------------------------------------------

constexpr std::size_t kEntries = 1000;

// Sparse, scattered keys, as record ids are.
const std::vector<std::int64_t>& keys() {
  static const std::vector<std::int64_t> all = [] {
    std::vector<std::int64_t> made;
    for (std::size_t i = 0; i < kEntries; ++i) made.push_back(static_cast<std::int64_t>(i * 7919 + 13));
    return made;
  }();
  return all;
}

using Object = std::shared_ptr<std::string>;

const std::vector<Object>& objects() {
  static const std::vector<Object> all = [] {
    std::vector<Object> made;
    for (std::size_t i = 0; i < kEntries; ++i) made.push_back(std::make_shared<std::string>(std::to_string(i)));
    return made;
  }();
  return all;
}

// Uniform verbs over every container measured, so one template runs them all.
struct SparsePlain {
  KXCSparseObjectArray<std::string> c{false};
  void set(std::int64_t k, const Object& o) { c.setObject(o, static_cast<std::uint64_t>(k)); }
  Object get(std::int64_t k) const { return c.objectAtIndex(static_cast<std::uint64_t>(k)); }
  bool has(std::int64_t k) const { return c.hasIndex(static_cast<std::uint64_t>(k)); }
  template <typename F>
  void each(F&& f) const {
    c.enumerateIndexesAndObjectsUsingBlock([&](std::uint64_t k, const Object& o, bool&) { f(k, o); });
  }
};
struct SparseSafed : SparsePlain {
  SparseSafed() { c = KXCSparseObjectArray<std::string>(true); }
};
struct Dictionary {
  KXCDictionaryWithIntKeys<std::string> c;
  void set(std::int64_t k, const Object& o) { c.setObject(o, k); }
  Object get(std::int64_t k) const { return c.objectForIntegerKey(k); }
  bool has(std::int64_t k) const { return c.objectForIntegerKey(k) != nullptr; }
  template <typename F>
  void each(F&& f) const {
    for (const auto& o : c.allValues()) f(0, o);
  }
};
template <typename Map>
struct Standard {
  Map c;
  void set(std::int64_t k, const Object& o) { c.insert_or_assign(k, o); }
  Object get(std::int64_t k) const {
    const auto found = c.find(k);
    return found == c.end() ? nullptr : found->second;
  }
  bool has(std::int64_t k) const { return c.contains(k); }
  template <typename F>
  void each(F&& f) const {
    for (const auto& [k, o] : c) f(k, o);
  }
};
using StdUnordered = Standard<std::unordered_map<std::int64_t, Object>>;
using StdOrdered = Standard<std::map<std::int64_t, Object>>;

template <typename C>
C filled() {
  C container;
  for (std::size_t i = 0; i < kEntries; ++i) container.set(keys()[i], objects()[i]);
  return container;
}

template <typename C>
void BM_Set(benchmark::State& state) {
  C container = filled<C>();
  bool reversed = false;
  for (auto _ : state) {
    // A different object each round: assigning the held one again would let
    // shared_ptr skip its count updates in some containers and not others.
    reversed = !reversed;
    for (std::size_t i = 0; i < kEntries; ++i) container.set(keys()[i], objects()[reversed ? kEntries - 1 - i : i]);
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kEntries));
}

template <typename C>
void BM_Get(benchmark::State& state) {
  const C container = filled<C>();
  for (auto _ : state) {
    for (const std::int64_t key : keys()) benchmark::DoNotOptimize(container.get(key));
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kEntries));
}

template <typename C>
void BM_Has(benchmark::State& state) {
  const C container = filled<C>();
  for (auto _ : state) {
    for (const std::int64_t key : keys()) {
      benchmark::DoNotOptimize(container.has(key));
      benchmark::DoNotOptimize(container.has(key + 1));  // never set
    }
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kEntries * 2));
}

template <typename C>
void BM_Enumerate(benchmark::State& state) {
  const C container = filled<C>();
  for (auto _ : state) {
    std::size_t lengths = 0;
    container.each([&](std::int64_t, const Object& o) { lengths += o->size(); });
    benchmark::DoNotOptimize(lengths);
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kEntries));
}

#define KXA_CONTAINER_BENCH(op)                                         \
  BENCHMARK(BM_##op<SparsePlain>)->Name(#op "/SparseObjectArray");      \
  BENCHMARK(BM_##op<SparseSafed>)->Name(#op "/SparseObjectArraySafed"); \
  BENCHMARK(BM_##op<Dictionary>)->Name(#op "/DictionaryWithIntKeys");   \
  BENCHMARK(BM_##op<StdUnordered>)->Name(#op "/std::unordered_map");    \
  BENCHMARK(BM_##op<StdOrdered>)->Name(#op "/std::map")

KXA_CONTAINER_BENCH(Set);
KXA_CONTAINER_BENCH(Get);
KXA_CONTAINER_BENCH(Has);
KXA_CONTAINER_BENCH(Enumerate);

// KXCIntegerMapTable holds plain integers: its peers are integer maps.
template <typename Map>
void BM_IntegerSetGetHas(benchmark::State& state) {
  Map table;
  for (const std::int64_t key : keys()) table[key] = key;
  for (auto _ : state) {
    std::int64_t sum = 0;
    for (const std::int64_t key : keys()) {
      table[key] = key + 1;
      const auto found = table.find(key);
      sum += found == table.end() ? 0 : found->second;
      sum += table.contains(key + 1) ? 1 : 0;
    }
    benchmark::DoNotOptimize(sum);
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kEntries * 3));
}

void BM_IntegerSetGetHasMapTable(benchmark::State& state) {
  KXCIntegerMapTable table;
  for (const std::int64_t key : keys()) table.setValue(key, key);
  for (auto _ : state) {
    std::int64_t sum = 0;
    for (const std::int64_t key : keys()) {
      table.setValue(key + 1, key);
      sum += table.valueForKey(key);
      sum += table.hasKey(key + 1) ? 1 : 0;
    }
    benchmark::DoNotOptimize(sum);
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kEntries * 3));
}

void BM_IntegerKeysMapTable(benchmark::State& state) {
  KXCIntegerMapTable table;
  for (const std::int64_t key : keys()) table.setValue(key, key);
  for (auto _ : state) benchmark::DoNotOptimize(table.allKeysAsNumbers());
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kEntries));
}

template <typename Map>
void BM_IntegerKeys(benchmark::State& state) {
  Map table;
  for (const std::int64_t key : keys()) table[key] = key;
  for (auto _ : state) {
    std::vector<std::int64_t> listed;
    listed.reserve(table.size());
    for (const auto& [key, value] : table) listed.push_back(key);
    benchmark::DoNotOptimize(listed);
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kEntries));
}

BENCHMARK(BM_IntegerSetGetHasMapTable)->Name("IntegerSetGetHas/IntegerMapTable");
BENCHMARK(BM_IntegerSetGetHas<std::unordered_map<std::int64_t, std::int64_t>>)
    ->Name("IntegerSetGetHas/std::unordered_map");
BENCHMARK(BM_IntegerSetGetHas<std::map<std::int64_t, std::int64_t>>)->Name("IntegerSetGetHas/std::map");
BENCHMARK(BM_IntegerKeysMapTable)->Name("IntegerKeys/IntegerMapTable");
BENCHMARK(BM_IntegerKeys<std::unordered_map<std::int64_t, std::int64_t>>)->Name("IntegerKeys/std::unordered_map");
BENCHMARK(BM_IntegerKeys<std::map<std::int64_t, std::int64_t>>)->Name("IntegerKeys/std::map");

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  KXABenchReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  const auto printItemsRatio = [&reporter](const std::string& what, const std::string& ours,
                                            const std::string& peer, const std::string& label) {
    reporter.printRatio(what, ours, peer, label, "items_per_second", 1e6, "M/s");
  };

  std::printf("\nlock cycles (KXCRWLock over std::shared_mutex):\n");
  for (const char* kind : {"Read", "Write"}) {
    const std::string ours = std::string("RWLock") + kind;
    const std::string peer = std::string("SharedMutex") + kind;
    printItemsRatio(std::string(kind) + ", 1 thread", ours, peer, "shared_mutex");
    for (const char* threads : {"2", "4"}) {
      const std::string suffix = std::string("/real_time/threads:") + threads;
      printItemsRatio(std::string(kind) + ", " + threads + " threads", ours + suffix, peer + suffix,
                          "shared_mutex");
    }
  }
  std::printf("\ncontainers, 1000 keys (ours over std::unordered_map):\n");
  for (const char* op : {"Set", "Get", "Has", "Enumerate"}) {
    const std::string peer = std::string(op) + "/std::unordered_map";
    for (const char* ours : {"SparseObjectArray", "SparseObjectArraySafed", "DictionaryWithIntKeys"}) {
      printItemsRatio(std::string(op) + " " + ours, std::string(op) + "/" + ours, peer, "unordered_map");
    }
    printItemsRatio(std::string(op) + " std::map", std::string(op) + "/std::map", peer, "unordered_map");
  }
  for (const char* op : {"IntegerSetGetHas", "IntegerKeys"}) {
    const std::string peer = std::string(op) + "/std::unordered_map";
    printItemsRatio(std::string(op) + " IntegerMapTable", std::string(op) + "/IntegerMapTable", peer,
                        "unordered_map");
    printItemsRatio(std::string(op) + " std::map", std::string(op) + "/std::map", peer, "unordered_map");
  }
  benchmark::Shutdown();
  return 0;
}

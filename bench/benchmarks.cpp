// Time and allocations of every case. "call" is the operation, "platform" its platform calls alone: the module's own
// share is the difference, which bench/run takes. A benchmark's name is kind|case or kind|case/length.

#include <benchmark/benchmark.h>

#include "bench/allocation_count.h"
#include "bench/cases.h"

namespace {

enum class Side { kCall, kPlatform };

void Measure(benchmark::State& state, const bench::Case& aCase, const cheap::Sizes& sizes, Side side) {
    bench::Fixture fixture(aCase, sizes);
    const auto once = [&fixture, side] {
        if (side == Side::kCall) {
            fixture.Call();
        } else {
            fixture.CallPlatform();
        }
    };
    once();  // what is made at a first call is none of a call's allocations
    const std::size_t before = AllocationCount();
    once();
    const std::size_t after = AllocationCount();
    for (auto _ : state) {
        once();
        benchmark::ClobberMemory();
    }
    state.counters["allocations"] = static_cast<double>(after - before);
}

void MeasureList(benchmark::State& state, const bench::ListCase& list, Side side) {
    const auto length = static_cast<int>(state.range(0));
    cheap::Sizes sizes;
    sizes.*list.length = length;
    Measure(state, bench::FindCase(list.caseName), sizes, side);
    state.SetComplexityN(length);
    state.counters["per_entry"] = benchmark::Counter(
        static_cast<double>(length), benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}

void Register(Side side) {
    const std::string prefix = side == Side::kCall ? "call|" : "platform|";
    for (const bench::Case& aCase : bench::Cases()) {
        benchmark::RegisterBenchmark((prefix + aCase.name).c_str(), [&aCase, side](benchmark::State& state) {
            Measure(state, aCase, cheap::Sizes(), side);
        });
    }
    const std::string listPrefix = "list " + prefix;
    for (const bench::ListCase& list : bench::ListCases()) {
        benchmark::RegisterBenchmark((listPrefix + list.name).c_str(),
                                     [&list, side](benchmark::State& state) { MeasureList(state, list, side); })
            ->Arg(10)
            ->Arg(1000)
            ->Arg(100000)
            ->Complexity(benchmark::oAuto);
    }
}

}  // namespace

int main(int argc, char** argv) {
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) {
        return 2;
    }
    Register(Side::kCall);
    Register(Side::kPlatform);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    return 0;
}

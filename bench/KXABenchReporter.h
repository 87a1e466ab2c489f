#pragma once
// The console reporter every bench program uses: prints Google Benchmark's
// table as usual and remembers each run's counters and times, so a program
// can print ours-against-peer ratios after the table.

#include <benchmark/benchmark.h>

#include <cstdio>
#include <map>
#include <optional>
#include <string>
#include <vector>

class KXABenchReporter : public benchmark::ConsoleReporter {
public:
    void ReportRuns(const std::vector<Run>& runs) override {
        ConsoleReporter::ReportRuns(runs);
        for (const Run& run : runs) {
            if (run.run_type != Run::RT_Iteration || run.iterations == 0) continue;
            Measured& measured = runs_[run.benchmark_name()];
            for (const auto& [name, counter] : run.counters) measured.counters[name] = counter.value;
            const auto iterations = static_cast<double>(run.iterations);
            measured.realMilliseconds = run.real_accumulated_time * 1e3 / iterations;
            measured.cpuMilliseconds = run.cpu_accumulated_time * 1e3 / iterations;
        }
    }

    /// A counter of a run ("bytes_per_second", "items_per_second", ...).
    std::optional<double> counter(const std::string& run, const std::string& name) const {
        const auto found = runs_.find(run);
        if (found == runs_.end()) return std::nullopt;
        const auto value = found->second.counters.find(name);
        if (value == found->second.counters.end()) return std::nullopt;
        return value->second;
    }
    std::optional<double> realMilliseconds(const std::string& run) const {
        const auto found = runs_.find(run);
        return found == runs_.end() ? std::nullopt : std::optional<double>(found->second.realMilliseconds);
    }
    std::optional<double> cpuMilliseconds(const std::string& run) const {
        const auto found = runs_.find(run);
        return found == runs_.end() ? std::nullopt : std::optional<double>(found->second.cpuMilliseconds);
    }

    /// Prints "what  ours unit  peerLabel peer unit  ratio ours/peer" for a
    /// counter, both divided by `scale`; prints nothing when either run is
    /// missing (a peer that is not installed).
    void printRatio(const std::string& what, const std::string& ours, const std::string& peer,
                    const std::string& peerLabel, const std::string& counterName = "bytes_per_second",
                    double scale = 1e6, const char* unit = "MB/s") const {
        const auto a = counter(ours, counterName);
        const auto b = counter(peer, counterName);
        if (!a || !b || *b <= 0) return;
        std::printf("%-34s %9.2f %s  %-18s %9.2f %s  ratio %.2fx\n", what.c_str(), *a / scale, unit,
                    peerLabel.c_str(), *b / scale, unit, *a / *b);
    }

private:
    struct Measured {
        std::map<std::string, double> counters;
        double realMilliseconds = 0;
        double cpuMilliseconds = 0;
    };
    std::map<std::string, Measured> runs_;
};

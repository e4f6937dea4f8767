// Time per event of the colour fit, for database sizes and channel counts the
// sensors have, in its three modes:
//   raw         lambda 0, raw similarity weights (unregularised fit)
//   normalised  lambda 0.01 with a normalised database (regularised normal equations)
//   client      lambda 0.01 set by a client without normalisation (heavy samples)
// Beside each, a plain double-precision version of the same fit (weights,
// normal equations, LU solve) as the baseline. Each iteration fits the next of
// 64 measurements, so nothing a call computes can be reused by the next one.
//
// The synthetic databases have random responses; the "unit" cases use the
// per-chip database of the sample unit xwca-t2 (425 sources, 5 channels), as
// `vantish open` caches it (the build writes it beside the benchmark; another
// cache file can be named with VANTISH_BENCH_CACHE).
//
// Run: bench_colour --benchmark_repetitions=9 --benchmark_report_aggregates_only=true
// (VANTISH_BENCH_SIMD=baseline, avx2 or avx512 forces the vector level.)
#include "colour/ColourCalculation.h"
#include "colour/MatrixUtilities.h"
#include "colour/SimdLevel.h"
#include "lightdb/Inspect.h"
#include "lightdb/LDBM.h"

#include <VantishPlatform/Paths.h>

#include <benchmark/benchmark.h>

#include <algorithm>
#include <atomic>
#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

// Heap calls of the process, so each benchmark can show how many one event makes.
namespace {
std::atomic<long> heapCalls{0};
}
extern "C" {
void* __libc_malloc(size_t);
void* __libc_calloc(size_t, size_t);
void* __libc_realloc(void*, size_t);
void __libc_free(void*);
void* malloc(size_t size)
{
    heapCalls.fetch_add(1, std::memory_order_relaxed);
    return __libc_malloc(size);
}
void* calloc(size_t count, size_t size)
{
    heapCalls.fetch_add(1, std::memory_order_relaxed);
    return __libc_calloc(count, size);
}
void* realloc(void* p, size_t size) { return __libc_realloc(p, size); }
void free(void* p) { __libc_free(p); }

void dgesv_(const int* n, const int* nrhs, double* a, const int* lda, int* ipiv, double* b, const int* ldb, int* info);
}

namespace {

enum Mode { Raw, Normalised, ClientLambda };

constexpr int kMeasurements = 64;

// The per-chip database of a cache file as the plug-in loads it.
SpectralDatabase loadUnitDatabase()
{
    const char* named = std::getenv("VANTISH_BENCH_CACHE");
    const std::filesystem::path file = named ? named : VANTISH_BENCH_UNIT_CACHE;
    LDBMFileSummary summary;
    if (LDBMInspect(file.string(), summary) != 0 || summary.kind != LDBMFileSummary::Kind::Cache)
        throw std::runtime_error("no per-chip cache at " + file.string());
    // The cache file for orientation 1 is found under the state root.
    VPSetPathRoot("/var/mobile", file.parent_path().parent_path().parent_path().string());
    SpectralDatabase db;
    db.allocate(uint32_t(summary.info.sources), uint32_t(summary.columns.size()));
    if (LDBMParseSmallDB(1, &summary.info, db.dbXYZ.data(), db.dbChannelResponses.data(), int(db.dbChannelCount)) !=
        LDBMResult::Ok)
        throw std::runtime_error("cannot read " + file.string());
    db.dbInfo = summary.info;
    return db;
}

SpectralDatabase makeDatabase(int N, int M)
{
    std::mt19937 rng(2024);
    std::uniform_real_distribution<float> response(0.05f, 1.0f);
    SpectralDatabase db;
    db.allocate(N, M);
    for (int i = 0; i < N; ++i) {
        float sum = 0.0f;
        for (int j = 0; j < M; ++j) {
            float r = response(rng);
            db.dbChannelResponses[size_t(j) * N + i] = r;
            sum += r;
        }
        for (int c = 0; c < 3; ++c) {
            float t = 0.0f;
            for (int j = 0; j < M; ++j)
                t += float((c + 2 * j) % 5 + 1) * db.dbChannelResponses[size_t(j) * N + i];
            db.dbXYZ[size_t(c) * N + i] = t + 0.2f * sum * sum / float(M);
        }
    }
    return db;
}

// Unit-length samples, each channel divided by its deviation: what calibration
// publishes in normalised mode.
void normalise(SpectralDatabase& db)
{
    int N = int(db.dbSampleCount), M = int(db.dbChannelCount);
    normalizedByEuklidNorm(db.dbChannelResponses.data(), N, M);
    db.channelStdDev.assign(M, 0.0f);
    calculateSTD(db.dbChannelResponses.data(), db.channelStdDev.data(), N, M);
    for (int j = 0; j < M; ++j)
        if (db.channelStdDev[j] != 0.0f)
            for (int i = 0; i < N; ++i)
                db.dbChannelResponses[size_t(j) * N + i] /= db.channelStdDev[j];
}

struct Setup {
    FitSettings fit;
    SpectralDatabase db;
    std::vector<std::vector<float>> measured; // kMeasurements of them

    // N = 0: the sample unit's database.
    Setup(Mode mode, int N, int M) : db(N > 0 ? makeDatabase(N, M) : loadUnitDatabase())
    {
        fit.lambda = mode == Raw ? 0.0f : 0.01f;
        fit.normalised = mode == Normalised;
        if (mode == Normalised)
            normalise(db);
        // Measurements near the database's own samples, each a little different.
        std::mt19937 rng(7);
        std::uniform_real_distribution<float> spread(0.9f, 1.1f);
        const int n = int(db.dbSampleCount), m = int(db.dbChannelCount);
        for (int k = 0; k < kMeasurements; ++k) {
            std::vector<float> x(static_cast<size_t>(m));
            for (int j = 0; j < m; ++j)
                x[size_t(j)] = std::max(db.dbChannelResponses[size_t(j) * n + size_t(k * 13 % n)], 0.01f) * spread(rng);
            measured.push_back(x);
        }
    }
};

// The same fit written plainly in double precision.
void baselineColour(const SpectralDatabase& db, const float* channels, double* xyz, bool normalised, double lambda,
                    double exponent, double offset)
{
    const int N = int(db.dbSampleCount), M = int(db.dbChannelCount);
    std::vector<double> x(channels, channels + M);
    auto sigma = [&](int j) {
        return normalised && !db.channelStdDev.empty() && db.channelStdDev[j] != 0.0f ? double(db.channelStdDev[j])
                                                                                      : 1.0;
    };
    if (normalised) {
        double length = 0.0;
        for (double v : x)
            length += v * v;
        length = std::sqrt(length);
        for (double& v : x)
            v /= length;
    }
    std::vector<double> w(N);
    for (int i = 0; i < N; ++i) {
        double dot = 0.0, qq = 0.0, xx = 0.0;
        for (int j = 0; j < M; ++j) {
            double q = db.dbChannelResponses[size_t(j) * N + i] * sigma(j);
            dot += q * x[j];
            qq += q * q;
            xx += x[j] * x[j];
        }
        w[i] = 1.0 / std::pow(1.0 - dot / std::sqrt(qq * xx) + offset, exponent);
    }
    if (normalised) {
        double largest = *std::max_element(w.begin(), w.end());
        for (double& v : w)
            v /= largest;
        for (int j = 0; j < M; ++j)
            x[j] /= sigma(j);
    }
    double G[64] = {}, C[24] = {};
    for (int i = 0; i < N; ++i) {
        double r[8];
        for (int j = 0; j < M; ++j)
            r[j] = db.dbChannelResponses[size_t(j) * N + i];
        for (int a = 0; a < M; ++a) {
            for (int b = 0; b < M; ++b)
                G[b * M + a] += w[i] * r[a] * r[b];
            for (int c = 0; c < 3; ++c)
                C[c * M + a] += w[i] * r[a] * db.dbXYZ[size_t(c) * N + i];
        }
    }
    for (int a = 0; a < M; ++a)
        G[a * M + a] += lambda;
    int n = M, nrhs = 3, info = 0, pivots[8];
    dgesv_(&n, &nrhs, G, &n, pivots, C, &n, &info);
    for (int c = 0; c < 3; ++c) {
        double sum = 0.0;
        for (int j = 0; j < M; ++j)
            sum += C[c * M + j] * x[j];
        xyz[c] = std::max(sum, 0.0);
    }
}

void reportHeapCalls(benchmark::State& state, long before)
{
    state.counters["heap/call"] = benchmark::Counter(double(heapCalls.load() - before) / double(state.iterations()));
}

void BM_Colour(benchmark::State& state, Mode mode)
{
    Setup setup(mode, int(state.range(0)), int(state.range(1)));
    const int M = int(setup.db.dbChannelCount);
    std::vector<float> x(M);
    float xyz[3];
    long before = heapCalls.load();
    size_t k = 0;
    for (auto _ : state) {
        const std::vector<float>& measured = setup.measured[k++ % kMeasurements];
        std::copy(measured.begin(), measured.end(), x.begin());
        colourCalculationDynamic(setup.db, setup.fit, x.data(), xyz, M);
        benchmark::DoNotOptimize(xyz);
    }
    reportHeapCalls(state, before);
    state.SetLabel(simdLevelName(activeSimdLevel()));
}

void BM_Baseline(benchmark::State& state, Mode mode)
{
    Setup setup(mode, int(state.range(0)), int(state.range(1)));
    double xyz[3];
    double lambda = setup.fit.lambda;
    double exponent = setup.fit.weightExponent;
    double offset = setup.fit.weightOffset;
    long before = heapCalls.load();
    size_t k = 0;
    for (auto _ : state) {
        const std::vector<float>& measured = setup.measured[k++ % kMeasurements];
        baselineColour(setup.db, measured.data(), xyz, mode == Normalised, lambda, exponent, offset);
        benchmark::DoNotOptimize(xyz);
    }
    reportHeapCalls(state, before);
}

void sizes(benchmark::internal::Benchmark* b)
{
    b->ArgNames({"N", "M"});
    for (int N : {100, 400, 880})
        for (int M : {4, 5})
            b->Args({N, M});
}

// The sample unit's database (N = 0 selects it).
void unit(benchmark::internal::Benchmark* b) { b->ArgNames({"unit", "M"})->Args({0, 5}); }

BENCHMARK_CAPTURE(BM_Colour, raw, Raw)->Apply(sizes);
BENCHMARK_CAPTURE(BM_Baseline, raw, Raw)->Apply(sizes);
BENCHMARK_CAPTURE(BM_Colour, normalised, Normalised)->Apply(sizes);
BENCHMARK_CAPTURE(BM_Baseline, normalised, Normalised)->Apply(sizes);
BENCHMARK_CAPTURE(BM_Colour, client, ClientLambda)->Apply(sizes);
BENCHMARK_CAPTURE(BM_Baseline, client, ClientLambda)->Apply(sizes);
BENCHMARK_CAPTURE(BM_Colour, raw, Raw)->Apply(unit);
BENCHMARK_CAPTURE(BM_Baseline, raw, Raw)->Apply(unit);
BENCHMARK_CAPTURE(BM_Colour, normalised, Normalised)->Apply(unit);
BENCHMARK_CAPTURE(BM_Baseline, normalised, Normalised)->Apply(unit);
BENCHMARK_CAPTURE(BM_Colour, client, ClientLambda)->Apply(unit);
BENCHMARK_CAPTURE(BM_Baseline, client, ClientLambda)->Apply(unit);

} // namespace

int main(int argc, char** argv)
{
    // VANTISH_BENCH_SIMD=baseline|avx2|avx512 runs the kernels at that level
    // (at most what the processor has), to compare the levels.
    if (const char* level = std::getenv("VANTISH_BENCH_SIMD")) {
        for (SimdLevel l : {SimdLevel::Baseline, SimdLevel::Avx2, SimdLevel::Avx512})
            if (std::string(level) == simdLevelName(l))
                forceSimdLevel(l);
    }
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv))
        return 1;
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    return 0;
}

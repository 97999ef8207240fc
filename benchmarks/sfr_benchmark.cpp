// The SFR of one region, from an edge of 5 degrees, beside other ways to it.

#include <benchmark/benchmark.h>

#include <string>
#ifdef QV_HAVE_VIGRA
#include <vigra/multi_array.hxx>
#include <vigra/slanted_edge_mtf.hxx>
#endif

#include "benchmarks/pictures.h"
#include "benchmarks/ratios.h"
#include "qvtester/tester.h"
#include "unit_tests/plain/sfr.h"

namespace {

void CalculateSFR(benchmark::State& state) {
  const cv::Mat region = EdgeRegion(static_cast<int>(state.range(0)), static_cast<int>(state.range(1)));
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    std::vector<float> freq;
    std::vector<float> sfr;
    float mtf50 = 0;
    tester.CalculateSFR(region, freq, sfr, mtf50);
    benchmark::DoNotOptimize(mtf50);
  }
}
BENCHMARK(CalculateSFR)->Args({200, 600})->Args({400, 1200});

void CalculateMTF(benchmark::State& state) {
  const cv::Mat region = EdgeRegion(static_cast<int>(state.range(0)), static_cast<int>(state.range(1)));
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    float mtf50 = 0;
    tester.CalculateMTF(region, mtf50);
    benchmark::DoNotOptimize(mtf50);
  }
}
BENCHMARK(CalculateMTF)->Args({200, 600})->Args({400, 1200});

void PlainSFR(benchmark::State& state) {
  const cv::Mat region = EdgeRegion(static_cast<int>(state.range(0)), static_cast<int>(state.range(1)));
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    std::vector<float> freq;
    std::vector<float> sfr;
    float mtf50 = 0;
    plain::CalculateSFR(tester, region, freq, sfr, mtf50);
    benchmark::DoNotOptimize(mtf50);
  }
}
BENCHMARK(PlainSFR)->Args({200, 600})->Args({400, 1200});

#ifdef QV_HAVE_VIGRA
void SlantedEdgeMtfOfVigra(benchmark::State& state) {
  const cv::Mat region = EdgeRegion(static_cast<int>(state.range(0)), static_cast<int>(state.range(1)));
  const vigra::MultiArrayView<2, float> view(vigra::Shape2(region.cols, region.rows),
                                             const_cast<float*>(region.ptr<float>()));
  for ([[maybe_unused]] auto _ : state) {
    std::vector<vigra::TinyVector<double, 2>> mtf;
    vigra::slantedEdgeMTF(view, mtf);
    benchmark::DoNotOptimize(mtf.data());
  }
}
BENCHMARK(SlantedEdgeMtfOfVigra)->Args({200, 600})->Args({400, 1200});
#endif

const Ratios kSfrRatios = {
    {"SFR, region 200 x 600", "CalculateSFR/200/600", {"PlainSFR/200/600"}, 0.30},
    {"SFR, region 200 x 600", "CalculateSFR/200/600", {"SlantedEdgeMtfOfVigra/200/600"}, 1.0 / 14},
    {"SFR, region 400 x 1200", "CalculateSFR/400/1200", {"PlainSFR/400/1200"}, 0.30},
    {"SFR, region 400 x 1200", "CalculateSFR/400/1200", {"SlantedEdgeMtfOfVigra/400/1200"}, 1.0 / 14},
    {"MTF50, region 200 x 600", "CalculateMTF/200/600", {"PlainSFR/200/600"}, 0.30},
    {"MTF50, region 200 x 600", "CalculateMTF/200/600", {"SlantedEdgeMtfOfVigra/200/600"}, 1.0 / 14},
    {"MTF50, region 400 x 1200", "CalculateMTF/400/1200", {"PlainSFR/400/1200"}, 0.30},
    {"MTF50, region 400 x 1200", "CalculateMTF/400/1200", {"SlantedEdgeMtfOfVigra/400/1200"}, 1.0 / 14},
};

}  // namespace

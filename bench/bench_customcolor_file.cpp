// A 4000x3000 JPEG through CustomColor (425) with every control set into a
// quality-98 4:2:0 JPEG, file to file, against libvips' command line doing the
// same colour work in the same run.
//
// vips has no single operation for CustomColor's chain (tint, saturation,
// temperature, contrast, levels), so its nearest chain is three commands
// through uncompressed .v files in /dev/shm:
//   vips recomb   tint scale and saturation as one 3x3 matrix (float out)
//   vips linear   tint offset, rounded and clamped to 8 bits (--uchar)
//   vips maplut   temperature, contrast and levels as one table per channel,
//                 saved as JPEG [Q=98,subsample-mode=on] (4:2:0, as ours)
// It differs from the shader only where the saturation step leaves [0, 1]
// (vips clamps there; the shader carries the value into the temperature step
// and its normalisation) and by rounding to 8 bits between the steps; the mean
// difference of the two outputs is printed and checked. The chain's values
// come from the effect itself (its uniforms after the same parameter text).
//
// Ours is processFile's native path (processFilePath: load as NV21,
// doProcessNV21 into RGBA, save as JPEG at quality 98). vips is timed as the
// processes it is; the same chain on a 16x16 picture gives its start-up share.
// The two sides alternate run by run; the ratio is reported as the median of
// the per-run ratios with their range.
#include <benchmark/benchmark.h>
#include <stdio.h>

#include <android/log.h>

#include <algorithm>
#include <string>
#include <vector>

#include "core/VFilterBufferedProcessorImpl.h"
#include "core/filters/sce/colorEffects.h"
#include "file_bench.h"
#include "vccore/vc_log.h"

namespace {

using namespace filebench;

constexpr int kWidth = 4000;
constexpr int kHeight = 3000;
constexpr int kQuality = 98;
constexpr int kRuns = 7;
// Every control of CustomColor, none at an extreme.
const char kParameter[] = "TE=60,TI=-40,CO=50,SA=30,HL=40,SL=-30";

std::string gDir, gShm;
std::vector<double> gOurs, gVips, gVipsStartup;

float uniform(const FullShaderEffects& effect, const char* name, int component = 0) {
    float v[4] = {};
    effect.getUniform(name, v);
    return v[component];
}

// Writes the matrix, the offsets and the table of vips' chain from the
// uniforms CustomColor holds after kParameter. "" on failure.
std::string writeChain() {
    CustomColor effect;
    effect.setOption("parameter", kParameter);
    float tint[3], offset[3];
    for (int k = 0; k < 3; ++k) tint[k] = uniform(effect, "u_tint_color", k);
    const float s = uniform(effect, "u_saturate");
    // Saturation: c * (1 + s) - s * 0.333 * (r + g + b); tint: T + (1 - T) * c.
    double m[3][3];
    for (int row = 0; row < 3; ++row) {
        offset[row] = 0;
        for (int col = 0; col < 3; ++col) {
            double sat = (row == col ? 1.0 + s : 0.0) - s * 0.333;
            m[row][col] = sat * (1.0 - tint[col]);
            offset[row] += static_cast<float>(sat * tint[col] * 255.0);
        }
    }
    FILE* f = fopen((gDir + "/custom.mat").c_str(), "w");
    if (f == nullptr) return "";
    fprintf(f, "3 3\n");
    for (auto& row : m) fprintf(f, "%.9f %.9f %.9f\n", row[0], row[1], row[2]);
    if (fclose(f) != 0) return "";

    // Temperature (its normalisation is 1 inside [0, 1]), contrast, levels.
    const float t = uniform(effect, "u_temperature"),
                tp = uniform(effect, "u_temperature_positive");
    const float contrast = uniform(effect, "u_contrast");
    const float is = uniform(effect, "u_input_shadow"), os = uniform(effect, "u_output_shadow");
    const float il = uniform(effect, "u_input_level"), ol = uniform(effect, "u_output_level");
    f = fopen((gDir + "/custom.ppm").c_str(), "wb");
    if (f == nullptr) return "";
    fprintf(f, "P6\n256 1\n255\n");
    for (int i = 0; i < 256; ++i) {
        for (int k = 0; k < 3; ++k) {
            double x = i / 255.0;
            double warm = k == 1 ? tp : (k == 0 ? t : -t);
            x = x + x * (1.0 - x) * warm;
            x = (x - 0.5) * contrast + 0.5;
            x = std::clamp((x - is) / il * ol + os, 0.0, 1.0);
            fputc(static_cast<int>(std::lround(x * 255.0)), f);
        }
    }
    if (fclose(f) != 0) return "";
    char offsets[128];
    snprintf(offsets, sizeof(offsets), "%.6f %.6f %.6f", offset[0], offset[1], offset[2]);
    return offsets;
}

std::string gOffsets;

// vips' chain from `in` to `out`; seconds, or -1.
double runVips(const std::string& in, const std::string& out) {
    const std::string a = gShm + "/a.v", b = gShm + "/b.v";
    const std::string cmd = "vips recomb '" + in + "' '" + a + "' '" + gDir + "/custom.mat'" +
                            " && vips linear --uchar -- '" + a + "' '" + b + "' '1 1 1' '" +
                            gOffsets + "' && vips maplut '" + b + "' '" + out +
                            "[Q=" + std::to_string(kQuality) + ",subsample-mode=on]' '" + gDir +
                            "/custom.ppm'; rc=$?; rm -f '" + a + "' '" + b + "'; exit $rc";
    return timeCommand(cmd, out);
}

void BM_CustomColorFile_OursAndVips(benchmark::State& state) {
    const std::string in = gDir + "/input.jpg", out = gDir + "/ours.jpg";
    auto* processor = static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create());
    processor->initialize();
    processor->setEffect(425);
    processor->setEffectParameter(kParameter);
    for (auto _ : state) {
        unlink(out.c_str());
        auto start = std::chrono::steady_clock::now();
        auto status = processor->processFilePath(in.c_str(), [&]() { return out.c_str(); });
        auto stop = std::chrono::steady_clock::now();
        if (status != VFilterBufferedProcessorImpl::FILE_OK || fileSize(out) <= 0) {
            state.SkipWithError("processFilePath failed");
            break;
        }
        double vips = runVips(in, gDir + "/vips.jpg");
        if (vips < 0) {
            state.SkipWithError("the vips chain failed (is libvips-tools installed?)");
            break;
        }
        gOurs.push_back(seconds(stop - start));
        gVips.push_back(vips);
    }
    processor->release();
    BufferedProcessor_Destroy(processor);
}

void BM_CustomColorFile_VipsStartup(benchmark::State& state) {
    for (auto _ : state) {
        double t = runVips(gDir + "/tiny.jpg", gDir + "/tiny_vips.jpg");
        if (t < 0) {
            state.SkipWithError("the vips chain failed on the small picture");
            break;
        }
        gVipsStartup.push_back(t);
    }
}

BENCHMARK(BM_CustomColorFile_OursAndVips)
    ->Iterations(kRuns)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();
BENCHMARK(BM_CustomColorFile_VipsStartup)
    ->Iterations(kRuns)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();

}  // namespace

int main(int argc, char** argv) {
    // Per-call debug lines would be timed too; errors still show.
    quietHeadless();
    gDir = makeTempDir("bench_customcolor_file");
    // The intermediates are large: keep them in memory where there is a tmpfs.
    struct stat st;
    bool shm = stat("/dev/shm", &st) == 0 && S_ISDIR(st.st_mode);
    gShm = shm ? makeTempDir("bench_customcolor_file", "/dev/shm") : gDir;
    if (gDir.empty() || gShm.empty() || !writeInput(gDir + "/input.jpg", kWidth, kHeight) ||
        !writeInput(gDir + "/tiny.jpg", 16, 16) || (gOffsets = writeChain()).empty()) {
        fprintf(stderr, "bench_customcolor_file: cannot write the input files in %s\n",
                gDir.c_str());
        return 1;
    }
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    double difference = meanDifference(gDir + "/ours.jpg", gDir + "/vips.jpg");
    removeDir(gDir);
    if (gShm != gDir) removeDir(gShm);

    if (gOurs.empty() || gVips.empty()) {
        fprintf(stderr, "bench_customcolor_file: a side did not run; no ratio\n");
        return 1;
    }
    std::vector<double> ratios;
    for (size_t i = 0; i < gOurs.size() && i < gVips.size(); ++i)
        ratios.push_back(gOurs[i] / gVips[i]);
    auto range = std::minmax_element(ratios.begin(), ratios.end());
    printf(
        "customcolor_file %dx%d JPEG q%d 4:2:0, \"%s\": ours (processFilePath) %.1f ms, vips "
        "recomb+linear+maplut %.1f ms (medians of %zu alternating runs)\n",
        kWidth, kHeight, kQuality, kParameter, median(gOurs) * 1e3, median(gVips) * 1e3,
        ratios.size());
    if (!gVipsStartup.empty()) {
        printf("  vips: of which about %.1f ms is the three processes' start-up (16x16)\n",
               median(gVipsStartup) * 1e3);
    }
    printf("  ours vs vips output: mean |difference| %.2f of 255 per channel\n", difference);
    if (difference < 0 || difference > 6.0) {
        fprintf(stderr, "bench_customcolor_file: the two outputs disagree; no ratio\n");
        return 1;
    }
    printf("ratio customcolor_file ours/vips = %.2f (per-run range %.2f-%.2f)\n", median(ratios),
           *range.first, *range.second);
    return 0;
}

// Run-time choice of the vector conversion paths.
#include <atomic>

#include "vc_image_convert_fast.h"
#include "vc_image_layout.h"

#if defined(__x86_64__)
bool VCConvert_sse2(const VCImage* source, VCImage* destination);
bool VCConvert_avx2(const VCImage* source, VCImage* destination);
#elif defined(__aarch64__)
bool VCConvert_neon(const VCImage* source, VCImage* destination);
#endif

namespace {

int detectLevel() {
#if defined(__x86_64__)
    __builtin_cpu_init();
    if (__builtin_cpu_supports("avx2")) return kVCConvertAvx2;
    return kVCConvertSse2;
#elif defined(__aarch64__)
    // NEON is part of the arm64 baseline.
    return kVCConvertNeon;
#else
    // No vector paths on other architectures: the reference loops run there.
    return kVCConvertScalar;
#endif
}

std::atomic<int> gLevel{-1};

}  // namespace

int VCConvert_cpuLevel(void) {
    static const int level = detectLevel();
    return level;
}

int VCConvert_level(void) {
    int level = gLevel.load();
    if (level < 0) {
        level = VCConvert_cpuLevel();
        gLevel.store(level);
    }
    return level;
}

int VCConvert_setLevel(int level) {
    const int cpu = VCConvert_cpuLevel();
    if (level < kVCConvertScalar) level = kVCConvertScalar;
    if (level > cpu) level = cpu;
    gLevel.store(level);
    return level;
}

bool VCConvert_fast(const VCImage* source, VCImage* destination) {
    // The kernels walk whole chroma blocks: odd 4:2:x geometry stays with the
    // reference loops, which bound their writes for it.
    if (!VCImage_parityOk(source->format, source->width, source->height) ||
        !VCImage_parityOk(destination->format, destination->width, destination->height))
        return false;
    switch (VCConvert_level()) {
#if defined(__x86_64__)
        case kVCConvertAvx2:
            return VCConvert_avx2(source, destination);
        case kVCConvertSse2:
            return VCConvert_sse2(source, destination);
#elif defined(__aarch64__)
        case kVCConvertNeon:
            return VCConvert_neon(source, destination);
#endif
        default:
            return false;
    }
}

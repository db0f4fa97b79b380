// The kernel table of every instruction set Highway builds for, and the run-time choice among
// them. Each target's table holds that target's variants; the plain bodies finish what a variant
// leaves, so a table needs no entry of its own for the last pixels of a row.
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/kernels_simd.cpp"
#include <hwy/foreach_target.h>  // must come before highway.h
#include <hwy/highway.h>

#include "kernels.h"
#include "simd/pixel_ops-inl.h"
#include "simd/rotation-inl.h"
#include "simd/statistics-inl.h"

HWY_BEFORE_NAMESPACE();
namespace kel {
namespace simd {
namespace HWY_NAMESPACE {

// The name Highway gives the target, as a constant.
constexpr const char *target_name(int64_t target) {
  switch (target) {
    case HWY_AVX3_DL:
      return "AVX3_DL";
    case HWY_AVX3:
      return "AVX3";
    case HWY_AVX2:
      return "AVX2";
    case HWY_SSE4:
      return "SSE4";
    case HWY_SSSE3:
      return "SSSE3";
    case HWY_SVE2:
      return "SVE2";
    case HWY_SVE:
      return "SVE";
    case HWY_NEON:
      return "NEON";
    case HWY_EMU128:
      return "EMU128";
    case HWY_SCALAR:
      return "SCALAR";
    default:
      return "vector";
  }
}

constexpr Kernels kTable = {target_name(HWY_TARGET),
                            BrightenRow,
                            DarkenRow,
                            MaskRow,
                            CopyRow,
                            BlendRow,
                            PasteRowWithKey,
                            BlendRowWithKey,
                            PrefetchForWriting,
                            kPasteKeyedReadsOut,
                            CountBins,
                            SumPixels,
                            BilinearRowU8,
                            BilinearRowI8,
                            NearestRowI8,
                            NonzeroTail};

const Kernels *TargetKernels() {
  return &kTable;
}

}  // namespace HWY_NAMESPACE
}  // namespace simd
}  // namespace kel
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace kel {
namespace simd {
HWY_EXPORT(TargetKernels);

const Kernels &chosen_kernels() {
  return *HWY_DYNAMIC_DISPATCH(TargetKernels)();
}
}  // namespace simd

const Kernels &kernels() {
  return simd::chosen_kernels();
}

}  // namespace kel
#endif  // HWY_ONCE

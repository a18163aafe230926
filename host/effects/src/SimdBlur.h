#pragma once

// Explicitly vectorised kernels of the Gaussian Blur (Highway, chosen for the
// processor on first use). The blur works on lines of "steps": a step is
// kBlurStepFloats contiguous floats (the four premultiplied components of
// kBlurStepPixels pixels, one pixel of each of kBlurStepPixels rows or columns
// side by side), and a line is count steps a stride apart. Beyond a line's ends
// its end steps repeat.
//
// Threads: every function is re-entrant; buffers passed in are the caller's.

#include <cstddef>
#include <cstdint>

namespace FX::detail::Simd
{

inline constexpr int kBlurStepPixels = 16;
inline constexpr int kBlurStepFloats = kBlurStepPixels * 4;

// One direction of the blur: when taps is set, a symmetric convolution with
// weights taps[0] (the centre) to taps[tapRadius] (the outermost pair); else a
// recursive filter of two second-order sections, each run forward as
//   y[n] = b0 x[n] + b1 x[n-1] - e1 y[n-1] - e2 y[n-2]
// and backward as
//   z[n] = c1 x[n+1] + c2 x[n+2] - e1 z[n+1] - e2 z[n+2],
// the result the sum of the four; forwardSteady and backwardSteady are each
// direction's output for a constant input of 1.
struct BlurLineKernel
{
    struct Section
    {
        float b0 = 0, b1 = 0, c1 = 0, c2 = 0, e1 = 0, e2 = 0;
        float forwardSteady = 0, backwardSteady = 0;
    };
    Section sections[2];
    const float* taps = nullptr;
    int tapRadius = 0;
};

// Blurs the line of inCount steps at inSource (steps inSourceStride floats
// apart) into outTarget (outTargetStride apart, not overlapping the source);
// the result is that of the line extended without end by its end steps.
void BlurLine(const float* inSource, std::ptrdiff_t inSourceStride, float* outTarget,
              std::ptrdiff_t outTargetStride, int inCount, const BlurLineKernel& inKernel);

// inCount 8-bit straight B, G, R, A pixels of each of inRows rows (the first
// at inFirst, each inRowBytes after the one before) to premultiplied floats in
// 0..1: row r's pixel i at outValues + r * inRowFloats + i * inPixelFloats.
void LoadPremultiplied8(const std::uint8_t* inFirst, std::ptrdiff_t inRowBytes, int inRows,
                        int inCount, float* outValues, std::ptrdiff_t inRowFloats,
                        std::ptrdiff_t inPixelFloats);

// The reverse, from premultiplied floats back to straight 8-bit pixels,
// rounded (colour 0 where alpha is 0).
void StoreStraight8(const float* inValues, std::ptrdiff_t inRowFloats, std::ptrdiff_t inPixelFloats,
                    int inRows, int inCount, std::uint8_t* outFirst, std::ptrdiff_t inRowBytes);

} // namespace FX::detail::Simd

// A command-line job for the comparison scripts: reads raw 8-bit BGRA frames of a
// background clip and a foreground clip, draws each foreground frame at half size
// with bilinear sampling over its background frame (IR_Motion onto the lower frame),
// and writes the composited frames as raw BGRA. Single-threaded, one frame at a time,
// the buffers reused for every frame.
//
// Usage: ir_motion_job WIDTH HEIGHT FRAMES BACKGROUND.raw FOREGROUND.raw OUTPUT.raw
//                      OFFSET_X OFFSET_Y
// The foreground's top-left corner lands at OFFSET_X, OFFSET_Y of the background.

#include "IR/ImageRenderer.h"

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <vector>

namespace
{

struct FileCloser
{
    void operator()(std::FILE* inFile) const { std::fclose(inFile); }
};
using File = std::unique_ptr<std::FILE, FileCloser>;

File Open(const char* inPath, const char* inMode)
{
    File file(std::fopen(inPath, inMode));
    if (!file)
        std::fprintf(stderr, "ir_motion_job: cannot open %s\n", inPath);
    return file;
}

} // namespace

int main(int argc, char** argv)
{
    if (argc != 9)
    {
        std::fprintf(stderr,
                     "usage: %s WIDTH HEIGHT FRAMES BACKGROUND FOREGROUND OUTPUT "
                     "OFFSET_X OFFSET_Y\n",
                     argv[0]);
        return 2;
    }
    const int width = std::atoi(argv[1]);
    const int height = std::atoi(argv[2]);
    const int frames = std::atoi(argv[3]);
    const int offsetX = std::atoi(argv[7]);
    const int offsetY = std::atoi(argv[8]);
    if (width <= 0 || height <= 0 || frames <= 0)
    {
        std::fprintf(stderr, "ir_motion_job: sizes and frame count must be positive\n");
        return 2;
    }
    File background = Open(argv[4], "rb");
    File foreground = Open(argv[5], "rb");
    File output = Open(argv[6], "wb");
    if (!background || !foreground || !output)
        return 1;
    const IR_PixelFormat format = kIR_PixelFormat_BGRA_8u;
    const auto rowBytes = static_cast<std::int32_t>(IR_MinimumRowBytes(format, width));
    const std::size_t frameBytes = static_cast<std::size_t>(rowBytes) * height;
    std::vector<std::uint8_t> lower(frameBytes), upper(frameBytes);
    // Half size, top-left corner at the offset: xd = xs / 2 + offsetX.
    IR_AffineMatrix matrix;
    matrix.a = 0.5;
    matrix.d = 0.5;
    matrix.tx = offsetX;
    matrix.ty = offsetY;
    double renderSeconds = 0.0;
    int done = 0;
    for (; done < frames; ++done)
    {
        if (std::fread(lower.data(), 1, frameBytes, background.get()) != frameBytes ||
            std::fread(upper.data(), 1, frameBytes, foreground.get()) != frameBytes)
            break;
        const auto start = std::chrono::steady_clock::now();
        const std::int32_t status =
            IR_Motion(upper.data(), rowBytes, format, width, height, lower.data(), rowBytes, format,
                      width, height, &matrix, 1.0f, 4, kIR_Field_All, true);
        renderSeconds +=
            std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
        if (status != kIR_NoError)
        {
            std::fprintf(stderr, "ir_motion_job: IR_Motion failed with %d\n", status);
            return 1;
        }
        if (std::fwrite(lower.data(), 1, frameBytes, output.get()) != frameBytes)
        {
            std::fprintf(stderr, "ir_motion_job: write failed\n");
            return 1;
        }
    }
    std::fprintf(stderr, "ir_motion_job: %d frames, %.3f ms per frame in IR_Motion\n", done,
                 done > 0 ? 1000.0 * renderSeconds / done : 0.0);
    return done == frames ? 0 : 1;
}

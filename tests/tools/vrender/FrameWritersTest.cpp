// The frame writers: Y4M headers and planes, PNG files committed in place,
// and the messages of outputs that cannot be made.

#include "FrameWriters.h"

#include "Options.h"
#include "VF/VideoFrame.h"
#include "VrenderTestSupport.h"

#include <algorithm>
#include <array>
#include <functional>
#include <string>
#include <tuple>

#include <gtest/gtest.h>

namespace
{

namespace fs = std::filesystem;
namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using vrender::Y4MChroma;

// A frame whose 4-byte pixel (x, y) is inPixel(x, y).
FrameRef MakeFrame(mt::PixelFormat inFormat, std::uint32_t inWidth, std::uint32_t inHeight,
                   const std::function<std::array<int, 4>(int, int)>& inPixel)
{
    FrameRef frame = VF::CreateVideoFrame(inFormat, inWidth, inHeight, mt::kPixelAspectRatio_Square,
                                          true, false);
    auto* base = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
    for (std::uint32_t y = 0; y < inHeight; ++y)
        for (std::uint32_t x = 0; x < inWidth; ++x)
            std::ranges::copy(inPixel(x, y), base + y * frame->GetRowBytes() + 4 * x);
    return frame;
}

// A BGRA frame whose pixel (x, y) is (B, G, R, A) = (x * 20, y * 30, 200 - x, inAlpha).
FrameRef MakeBGRA(std::uint32_t inWidth, std::uint32_t inHeight, int inAlpha)
{
    return MakeFrame(mt::kPixelFormat_BGRA_4444_8u, inWidth, inHeight,
                     [&](int x, int y) {
                         return std::array<int, 4>{x * 20, y * 30, 200 - x, inAlpha};
                     });
}

using FrameWritersTest = vrendertest::ScratchDirectoryTest;

TEST_F(FrameWritersTest, Y4MHeaderSpellsEveryField)
{
    const std::tuple<mt::FrameRate, mt::FieldType, mt::PixelAspectRatio, Y4MChroma, const char*>
        cases[] = {{mt::kFrameRate_Video2997, mt::kFieldType_UpperFirst,
                    mt::PixelAspectRatio(10, 11), Y4MChroma::k420, "F30000:1001 It A10:11 C420"},
                   {mt::kFrameRate_Video25, mt::kFieldType_LowerFirst, mt::kPixelAspectRatio_Square,
                    Y4MChroma::k444, "F25:1 Ib A1:1 C444"},
                   {mt::kFrameRate_Zero, mt::kFieldType_Progressive, mt::kPixelAspectRatio_Square,
                    Y4MChroma::k444, "F0:1 Ip A1:1 C444"}};
    for (const auto& [rate, field, aspect, chroma, fields] : cases)
        EXPECT_EQ(vrender::MakeY4MHeader({1920, 1080, rate, field, aspect}, chroma),
                  std::string("YUV4MPEG2 W1920 H1080 ") + fields + " XCOLORRANGE=LIMITED\n");
}

TEST_F(FrameWritersTest, Y4M420PlanesAreExactOnAnOddSizedFrameAndSizesMustMatch)
{
    // VUYA bytes are V, U, Y, A; (x, y) holds Y = 16 + 10 (3y + x),
    // U = 100 + x + 10y, V = 200 - x - 10y.
    const FrameRef frame =
        MakeFrame(mt::kPixelFormat_VUYA_4444_8u, 3, 3,
                  [](int x, int y) {
                      return std::array<int, 4>{200 - x - 10 * y, 100 + x + 10 * y,
                                                16 + 10 * (3 * y + x), 255};
                  });
    const fs::path path = mDirectory / "tiny.y4m";
    auto writer = vrender::CreateY4MWriter(nullptr, path.string(), Y4MChroma::k420);
    std::string error;
    ASSERT_TRUE(writer->Begin({3, 3}, error)) << error;
    vrender::EncodedFrame encoded = writer->Encode(0, frame);
    ASSERT_EQ(encoded.mError, "");
    ASSERT_TRUE(writer->Commit(encoded, error)) << error;
    EXPECT_EQ(writer->Encode(9, MakeBGRA(2, 3, 255)).mError, "frame 9 is 2x3, the stream 3x3");
    ASSERT_TRUE(writer->Finish(error)) << error;

    std::string expected = "YUV4MPEG2 W3 H3 F25:1 Ip A1:1 C420 XCOLORRANGE=LIMITED\nFRAME\n";
    for (int i = 0; i < 9; ++i)
        expected += static_cast<char>(16 + 10 * i);
    // Each chroma sample is the rounded mean of its 2x2 block; the last
    // column and row repeat themselves.
    for (const int value : {106, 107, 121, 122, 195, 193, 180, 178})
        expected += static_cast<char>(value);
    EXPECT_EQ(vrendertest::ReadText(path), expected);
}

TEST_F(FrameWritersTest, OutputThatCannotBeCreatedIsNamed)
{
    const fs::path blocker = mDirectory / "blocker";
    std::ofstream(blocker.string()) << "x";
    const std::unique_ptr<vrender::FrameWriter> writers[] = {
        vrender::CreateY4MWriter(nullptr, (blocker / "out.y4m").string(), Y4MChroma::k420),
        vrender::CreatePngSequenceWriter((blocker / "f_%d.png").string())};
    for (const auto& writer : writers)
    {
        std::string error;
        EXPECT_FALSE(writer->Begin(vrender::StreamInfo{}, error));
        EXPECT_EQ(error.rfind("cannot create directory '" + blocker.string() + "': ", 0), 0u)
            << error;
    }
}

TEST_F(FrameWritersTest, PngFramesAppearOnlyOnCommitAndReadBackWithAlpha)
{
    const std::string pattern = (mDirectory / "seq" / "f_%03d.png").string();
    auto writer = vrender::CreatePngSequenceWriter(pattern);
    std::string error;
    ASSERT_TRUE(writer->Begin(vrender::StreamInfo{}, error)) << error;
    vrender::EncodedFrame encoded = writer->Encode(7, MakeBGRA(5, 4, 128));
    ASSERT_EQ(encoded.mError, "");
    const fs::path final = mDirectory / "seq" / "f_007.png";
    EXPECT_FALSE(fs::exists(final));
    EXPECT_TRUE(fs::exists(encoded.mTemporaryPath));
    ASSERT_TRUE(writer->Commit(encoded, error)) << error;
    EXPECT_TRUE(fs::exists(final));
    const auto fileCount = [&] {
        return std::distance(fs::directory_iterator(final.parent_path()), fs::directory_iterator());
    };
    EXPECT_EQ(fileCount(), 1) << "no temporary file is left";

    // A discarded frame leaves nothing behind.
    encoded = writer->Encode(3, MakeBGRA(3, 2, 255));
    ASSERT_TRUE(fs::exists(encoded.mTemporaryPath));
    const std::string temporary = encoded.mTemporaryPath;
    writer->Discard(encoded);
    EXPECT_FALSE(fs::exists(temporary));
    EXPECT_EQ(fileCount(), 1);
}

} // namespace

#include "VF/PngFile.h"

#include "FrameTestSupport.h"
#include "VF/VideoFrameManipulators.h"

#include <csetjmp>
#include <filesystem>
#include <fstream>
#include <memory>
#include <unistd.h>
#include <zlib.h>

#include <gtest/gtest.h>
#include <png.h>

namespace
{

using namespace vftest;

// A straight BGRA frame with every channel varying and translucent alpha.
Frame MakePattern(uint32_t inWidth, uint32_t inHeight)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, inWidth, inHeight);
    for (uint32_t i = 0; i < 4 * inWidth * inHeight; ++i)
        Row(frame, int32_t(i / (4 * inWidth)))[i % (4 * inWidth)] = uint8_t(i * 13 + i / 7);
    return frame;
}

bool SamePixels(const Frame& inA, const Frame& inB)
{
    bool same = inA->GetBounds() == inB->GetBounds();
    for (int32_t y = 0; same && y < inA->GetBounds().Height(); ++y)
        same = std::memcmp(Row(inA, y), Row(inB, y), size_t(inA->GetBounds().Width()) * 4) == 0;
    return same;
}

void WriteBytes(const std::string& inPath, const std::vector<char>& inBytes)
{
    std::ofstream(inPath, std::ios::binary).write(inBytes.data(), std::streamsize(inBytes.size()));
}

// Reads the file; the frame must be left empty unless the read succeeds.
VF::PngStatus Read(const std::string& inPath, Frame& outFrame)
{
    outFrame = MakePattern(1, 1);
    const VF::PngStatus status = VF::ReadPngFile(inPath, outFrame);
    EXPECT_EQ(bool(outFrame), status.Succeeded()) << status.mMessage;
    return status;
}

std::string BigEndian32(uint32_t inValue)
{
    return {char(inValue >> 24), char(inValue >> 16), char(inValue >> 8), char(inValue)};
}

// A one-row 16-bit PNG file of colour type inColorType, made here byte by
// byte, so that the reader is checked against files it did not write.
std::vector<char> MakePng16(int inColorType, uint32_t inWidth,
                            const std::vector<uint16_t>& inSamples)
{
    const auto chunk = [](const std::string& inType, const std::string& inData)
    {
        const std::string body = inType + inData;
        return BigEndian32(uint32_t(inData.size())) + body +
               BigEndian32(uint32_t(
                   crc32(0, reinterpret_cast<const Bytef*>(body.data()), uInt(body.size()))));
    };
    std::string raw(1, '\0');
    for (const uint16_t sample : inSamples)
        raw += {char(sample >> 8), char(sample)};
    std::vector<Bytef> packed(compressBound(uLong(raw.size())));
    uLongf packedSize = uLongf(packed.size());
    EXPECT_EQ(compress(packed.data(), &packedSize, reinterpret_cast<const Bytef*>(raw.data()),
                       uLong(raw.size())),
              Z_OK);
    const std::string file =
        "\x89PNG\r\n\x1a\n" +
        chunk("IHDR",
              BigEndian32(inWidth) + BigEndian32(1) + std::string{16, char(inColorType), 0, 0, 0}) +
        chunk("IDAT", std::string(packed.begin(), packed.begin() + long(packedSize))) +
        chunk("IEND", "");
    return {file.begin(), file.end()};
}

// A PNG file as stored: IHDR depth and colour type, and the rows' bytes
// (16-bit samples most significant byte first), read without transforms.
struct RawPng
{
    int mDepth = 0;
    int mColorType = -1;
    std::vector<uint8_t> mBytes;
    png_structp mPng = png_create_read_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
    png_infop mInfo = png_create_info_struct(mPng);
    ~RawPng() { png_destroy_read_struct(&mPng, &mInfo, nullptr); }
};

void ReadRaw(RawPng& ioRaw, FILE* inFile)
{
    if (setjmp(png_jmpbuf(ioRaw.mPng)) != 0)
        return ADD_FAILURE() << "libpng cannot read the file";
    png_init_io(ioRaw.mPng, inFile);
    png_read_png(ioRaw.mPng, ioRaw.mInfo, PNG_TRANSFORM_IDENTITY, nullptr);
    ioRaw.mDepth = png_get_bit_depth(ioRaw.mPng, ioRaw.mInfo);
    ioRaw.mColorType = png_get_color_type(ioRaw.mPng, ioRaw.mInfo);
    const png_bytepp rows = png_get_rows(ioRaw.mPng, ioRaw.mInfo);
    for (png_uint_32 y = 0; y < png_get_image_height(ioRaw.mPng, ioRaw.mInfo); ++y)
        ioRaw.mBytes.insert(ioRaw.mBytes.end(), rows[y],
                            rows[y] + png_get_rowbytes(ioRaw.mPng, ioRaw.mInfo));
}

// 16-bit samples whose 8-bit values round differently from truncation.
constexpr uint16_t kDeepSamples[] = {0x8000, 0x8080, 0x7FFF, 0xFFFF,
                                     0x0180, 0x00FF, 0x1234, 0xFEDC};

// Each case works in its own temporary directory.
class PngFileTest : public ::testing::Test
{
protected:
    void SetUp() override { std::filesystem::create_directories(mDirectory); }
    void TearDown() override { std::filesystem::remove_all(mDirectory); }
    std::string PathOf(const std::string& inName) const { return (mDirectory / inName).string(); }

    const std::filesystem::path mDirectory =
        std::filesystem::temp_directory_path() /
        ("vf_png_test_" + std::to_string(::getpid()) + "_" +
         ::testing::UnitTest::GetInstance()->current_test_info()->name());
};

TEST_F(PngFileTest, WriteThenReadIsExactForRGBAOpaqueForRGBAndConvertsFloat)
{
    const Frame frame = MakePattern(7, 5);
    const Frame floats = MakeFrame(mt::kPixelFormat_BGRA_4444_32f, 7, 5);
    ASSERT_EQ(VF::VideoFrameManipulators::CopyFrame(frame, floats, mt::kRenderQuality_Max),
              QRT::kResult_Success);
    Frame read;
    for (const Frame& written : {frame, floats})
    {
        const VF::PngStatus status = VF::WritePngFile(PathOf("pattern.png"), written);
        ASSERT_TRUE(status.Succeeded()) << status.mMessage;
        ASSERT_EQ(Read(PathOf("pattern.png"), read).mMessage, "");
        EXPECT_EQ(
            std::tuple(read->GetPixelFormat(), read->GetAlphaChannel(), SamePixels(read, frame)),
            std::tuple(mt::kPixelFormat_BGRA_4444_8u, mt::kAlphaChannel_Straight, true));
    }
    ASSERT_TRUE(VF::WritePngFile(PathOf("rgb.png"), frame, VF::PngChannels::kRGB).Succeeded());
    ASSERT_TRUE(Read(PathOf("rgb.png"), read).Succeeded());
    EXPECT_EQ(std::pair(std::memcmp(Row(read, 1, 2), Row(frame, 1, 2), 3), int{Row(read, 1, 2)[3]}),
              std::pair(0, 255));
}

TEST_F(PngFileTest, TruncatedOrCorruptedFileIsMalformedNotACrash)
{
    const std::string path = PathOf("whole.png");
    ASSERT_TRUE(VF::WritePngFile(path, MakePattern(64, 64)).Succeeded());
    std::ifstream in(path, std::ios::binary);
    const std::vector<char> bytes{std::istreambuf_iterator<char>(in), {}};
    Frame read;
    for (const size_t keep : {bytes.size() / 2, size_t{40}})
    {
        const std::string cut = PathOf("cut" + std::to_string(keep) + ".png");
        WriteBytes(cut, std::vector<char>(bytes.begin(), bytes.begin() + keep));
        const VF::PngStatus status = Read(cut, read);
        EXPECT_EQ(status.mResult, VF::kResult_PngMalformed) << keep;
        EXPECT_EQ(status.mMessage, cut + ": the file ends early (truncated)");
    }
    // A damaged checksum of the picture data is named.
    std::vector<char> damaged = MakePng16(0, 2, {1, 2});
    damaged[damaged.size() - 13] ^= 1;
    WriteBytes(PathOf("crc.png"), damaged);
    EXPECT_EQ(Read(PathOf("crc.png"), read).mMessage, PathOf("crc.png") + ": IDAT: CRC error");
}

TEST_F(PngFileTest, SixteenBitFilesReadAsStoredRoundedToEightBits)
{
    // Colour type, channels, and which sample (-1: opaque) gives R, G, B, A.
    const std::tuple<int, uint32_t, std::array<int, 4>> cases[] = {
        {PNG_COLOR_TYPE_GRAY, 1, {0, 0, 0, -1}},
        {PNG_COLOR_TYPE_GRAY_ALPHA, 2, {0, 0, 0, 1}},
        {PNG_COLOR_TYPE_RGB, 3, {0, 1, 2, -1}},
        {PNG_COLOR_TYPE_RGB_ALPHA, 4, {0, 1, 2, 3}}};
    for (const auto& [colorType, channels, sources] : cases)
    {
        SCOPED_TRACE(colorType);
        const uint32_t width = 8;
        std::vector<uint16_t> samples;
        for (uint32_t i = 0; i < width * channels; ++i)
            samples.push_back(kDeepSamples[(i * 3 + i / 8) % 8]);
        WriteBytes(PathOf("deep.png"), MakePng16(colorType, width, samples));
        Frame read;
        ASSERT_TRUE(Read(PathOf("deep.png"), read).Succeeded());
        for (uint32_t x = 0; x < width; ++x)
            for (int c = 0; c < 4; ++c)
            {
                const int source = sources[size_t(c)];
                const uint32_t v = source < 0 ? 65535 : samples[x * channels + uint32_t(source)];
                // Stored BGRA: R at byte 2, B at byte 0.
                const int byte = c == 3 ? 3 : 2 - c;
                EXPECT_EQ(Row(read, 0, int32_t(x))[byte], (v * 255 + 32767) / 65535)
                    << "pixel " << x << " channel " << c;
            }
    }
}

// The depth each format writes at is checked through vrender (CommandLineRunTest).
TEST_F(PngFileTest, DeepFramesWriteSixteenBitSamplesAsTheyAre)
{
    const Frame deep = MakeFrame(mt::kPixelFormat_BGRA_4444_16u, 2, 1);
    auto* samples = reinterpret_cast<uint16_t*>(Row(deep, 0));
    std::copy(std::begin(kDeepSamples), std::end(kDeepSamples), samples);
    const VF::PngStatus status =
        VF::WritePngFile(PathOf("deep.png"), deep, VF::PngChannels::kRGBA, VF::PngDepth::k16);
    ASSERT_TRUE(status.Succeeded()) << status.mMessage;
    RawPng raw;
    const std::unique_ptr<FILE, int (*)(FILE*)> file(std::fopen(PathOf("deep.png").c_str(), "rb"),
                                                     &std::fclose);
    ReadRaw(raw, file.get());
    EXPECT_EQ(std::pair(raw.mDepth, raw.mColorType), std::pair(16, PNG_COLOR_TYPE_RGB_ALPHA));
    ASSERT_EQ(raw.mBytes.size(), 16u);
    for (size_t i = 0; i < 8; ++i)
    {
        // File order R, G, B, A; frame order B, G, R, A.
        const uint16_t expected = samples[i / 4 * 4 + (i % 4 == 3 ? 3 : 2 - i % 4)];
        EXPECT_EQ(raw.mBytes[2 * i] << 8 | raw.mBytes[2 * i + 1], expected) << i;
    }
}

TEST_F(PngFileTest, GarbageEmptyAndMissingFilesCannotBeOpened)
{
    const std::string garbage = PathOf("garbage.png"), empty = PathOf("empty.png");
    const std::string missing = PathOf("missing.png");
    WriteBytes(garbage, std::vector<char>(300, 'x'));
    WriteBytes(empty, {});
    Frame read;
    for (const auto& [path, message] :
         {std::pair{garbage, garbage + ": not a PNG file"}, std::pair{empty, std::string()},
          std::pair{missing, missing + ": No such file or directory"}})
    {
        const VF::PngStatus status = Read(path, read);
        EXPECT_EQ(status.mResult, VF::kResult_PngCannotOpen) << path;
        EXPECT_TRUE(message.empty() || status.mMessage == message) << status.mMessage;
    }
    const std::string unwritable = PathOf("no/such/directory/out.png");
    const VF::PngStatus status = VF::WritePngFile(unwritable, MakePattern(2, 2));
    EXPECT_EQ(status.mResult, VF::kResult_PngWriteFailed);
    EXPECT_EQ(status.mMessage.rfind(unwritable + ": ", 0), 0u);
}

} // namespace

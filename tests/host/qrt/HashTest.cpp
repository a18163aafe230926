#include "QRT/Hash.h"

#include "mvxcore/config/Error.h"

#include <cstring>
#include <vector>

#include <gtest/gtest.h>
#include <xxhash.h>

namespace
{

// The documented chaining rule, computed independently: add the size to the
// little-endian length word in bytes 12..15, hash (value || data) with
// XXH3-128, keep the low 96 digest bits little-endian and the length.
QRT::HashValue ReferenceMix(const QRT::HashValue& inHash, const void* inData, size_t inSize)
{
    std::vector<uint8_t> input(inHash.mBytes.begin(), inHash.mBytes.end());
    uint32_t length = 0;
    std::memcpy(&length, &input[12], 4); // the test machines are little-endian
    length += static_cast<uint32_t>(inSize);
    std::memcpy(&input[12], &length, 4);
    const uint8_t* bytes = static_cast<const uint8_t*>(inData);
    input.insert(input.end(), bytes, bytes + inSize);
    const XXH128_hash_t digest = XXH3_128bits(input.data(), input.size());
    QRT::HashValue result;
    std::memcpy(&result.mBytes[0], &digest.low64, 8);
    const uint32_t high = static_cast<uint32_t>(digest.high64);
    std::memcpy(&result.mBytes[8], &high, 4);
    std::memcpy(&result.mBytes[12], &length, 4);
    return result;
}

TEST(HashTest, EveryRunFollowsTheChainingRuleAndTheRunningLengthWraps)
{
    QRT::HashValue wrapping;
    EXPECT_TRUE(wrapping.IsZero());
    // An empty run still changes the value.
    QRT::MixHash::MixInData(wrapping, nullptr, 0);
    EXPECT_FALSE(wrapping.IsZero());
    EXPECT_EQ(wrapping.GetRunningLength(), 0u);
    QRT::MixHash::MixInValue(wrapping, uint64_t{7});
    EXPECT_EQ(wrapping.GetRunningLength(), 8u);
    wrapping.mBytes[12] = 0xFE;
    wrapping.mBytes[13] = wrapping.mBytes[14] = wrapping.mBytes[15] = 0xFF;
    QRT::MixHash::MixInString(wrapping, "abc");
    EXPECT_EQ(wrapping.GetRunningLength(), 1u);
    const QRT::HashValue before = wrapping;
    EXPECT_THROW(QRT::MixHash::MixInData(wrapping, nullptr, 4), mvxcore::config::Error);
    EXPECT_EQ(wrapping, before);
    // Every run follows the chaining rule; Guids mix as their bytes.
    QRT::HashValue expected;
    expected = ReferenceMix(expected, "ML::RenderableNodeCommonImpl", 28);
    const uint32_t quality = 5;
    expected = ReferenceMix(expected, &quality, sizeof(quality));
    QRT::HashValue hash;
    QRT::MixHash::MixInString(hash,
                              QRT::ImmutableString::CreateStatic("ML::RenderableNodeCommonImpl"));
    QRT::MixHash::MixInValue(hash, quality);
    EXPECT_EQ(hash, expected);
    EXPECT_EQ(hash.GetRunningLength(), 32u);

    // Above the one-shot buffer the streaming path must give the same digest.
    for (size_t size : {size_t{2048}, size_t{2049}})
    {
        std::vector<uint8_t> data(size);
        for (size_t i = 0; i < size; ++i)
            data[i] = static_cast<uint8_t>(i * 31 + 7);
        QRT::HashValue extended = hash;
        QRT::MixHash::MixInData(extended, data.data(), data.size());
        EXPECT_EQ(extended, ReferenceMix(hash, data.data(), data.size())) << size;
    }

    QRT::HashValue whole;
    QRT::MixHash::MixInString(whole, "abc");
    // Keys are stored by the frame cache and compared between runs: a change
    // of chaining, byte order or length handling must show up here.
    EXPECT_EQ(whole, ReferenceMix(QRT::HashValue(), "abc", 3));
    EXPECT_EQ(QRT::HashValueToGuid(whole).ToString(), "{80b88241-fce6-a9d5-7a48-03b700000003}");

    // Guids mix as their memory bytes; keys convert word by word.
    QRT::HashValue viaGuid;
    QRT::MixHash::MixInGuid(viaGuid, QRT::Guid("{01020304-0506-0708-090a-0b0c0d0e0f10}"));
    const uint8_t bytes[16] = {4, 3, 2, 1, 6, 5, 8, 7, 9, 10, 11, 12, 13, 14, 15, 16};
    EXPECT_EQ(viaGuid, ReferenceMix(QRT::HashValue(), bytes, sizeof(bytes)));

    for (uint8_t i = 0; i < 16; ++i)
        hash.mBytes[i] = static_cast<uint8_t>(0x10 + i);
    EXPECT_EQ(QRT::HashValueToGuid(hash).ToString(), "{13121110-1716-1514-1b1a-19181f1e1d1c}");
}

} // namespace

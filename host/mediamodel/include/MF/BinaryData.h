#pragma once

// MF::BinaryData: an immutable block of bytes that travels with media
// requests (a source's opaque stream data, a clip's modification state,
// an effect's opaque parameters).
//
// A value type. The bytes are copied once when the block is made and are
// never written afterwards; copies of a block share them, so copying is
// cheap and a block may be read from any number of threads at once. An
// empty block has no bytes: GetData answers null and GetSize zero.

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string_view>
#include <vector>

namespace MF
{

class BinaryData
{
public:
    // An empty block.
    BinaryData() noexcept = default;

    // A block holding a copy of inSize bytes from inData. inData may be null
    // only when inSize is zero (contract "inData != nullptr || inSize == 0").
    BinaryData(const void* inData, std::size_t inSize);

    // A block holding a copy of inBytes.
    explicit BinaryData(std::span<const std::uint8_t> inBytes);

    // A block taking over inBytes without copying them.
    explicit BinaryData(std::vector<std::uint8_t>&& inBytes);

    // A block holding the characters of inText (no terminating zero).
    static BinaryData FromText(std::string_view inText);

    // The first byte, or null for an empty block. Valid as long as this
    // block or a copy of it lives.
    const std::uint8_t* GetData() const noexcept;

    std::size_t GetSize() const noexcept;

    bool IsEmpty() const noexcept { return GetSize() == 0; }

    std::span<const std::uint8_t> GetBytes() const noexcept { return {GetData(), GetSize()}; }

    // Blocks are equal when they hold the same bytes, shared or not.
    friend bool operator==(const BinaryData& inLeft, const BinaryData& inRight) noexcept;

private:
    // Null for an empty block; never an empty vector.
    std::shared_ptr<const std::vector<std::uint8_t>> mBytes;
};

} // namespace MF

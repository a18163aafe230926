#include "MF/BinaryData.h"

#include "mvxcore/debug/Contract.h"

#include <algorithm>

namespace MF
{

BinaryData::BinaryData(const void* inData, std::size_t inSize)
{
    MVX_INPUT_CONTRACT(inData != nullptr || inSize == 0);
    if (inSize == 0)
        return;
    const auto* first = static_cast<const std::uint8_t*>(inData);
    mBytes = std::make_shared<const std::vector<std::uint8_t>>(first, first + inSize);
}

BinaryData::BinaryData(std::span<const std::uint8_t> inBytes)
    : BinaryData(inBytes.data(), inBytes.size())
{
}

BinaryData::BinaryData(std::vector<std::uint8_t>&& inBytes)
{
    if (!inBytes.empty())
        mBytes = std::make_shared<const std::vector<std::uint8_t>>(std::move(inBytes));
}

BinaryData BinaryData::FromText(std::string_view inText)
{
    return BinaryData(inText.data(), inText.size());
}

const std::uint8_t* BinaryData::GetData() const noexcept
{
    return mBytes ? mBytes->data() : nullptr;
}

std::size_t BinaryData::GetSize() const noexcept
{
    return mBytes ? mBytes->size() : 0;
}

bool operator==(const BinaryData& inLeft, const BinaryData& inRight) noexcept
{
    if (inLeft.mBytes == inRight.mBytes)
        return true;
    return std::ranges::equal(inLeft.GetBytes(), inRight.GetBytes());
}

} // namespace MF

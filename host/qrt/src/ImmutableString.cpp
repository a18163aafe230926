#include "QRT/ImmutableString.h"

#include "QRT/Allocator.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <atomic>
#include <cstring>
#include <new>
#include <utility>

namespace QRT
{

// The header of a dynamic string's single allocation; the text and its
// terminating zero follow it directly.
struct ImmutableString::SharedBuffer
{
    std::atomic<uint32_t> mCount{1};

    char* Text() noexcept { return reinterpret_cast<char*>(this + 1); }
};

ImmutableString ImmutableString::CreateStatic(const char* inLiteral)
{
    MVX_INPUT_CONTRACT(inLiteral != nullptr);
    return ImmutableString(inLiteral, std::strlen(inLiteral), nullptr);
}

ImmutableString ImmutableString::CreateDynamic(std::string_view inText)
{
    if (inText.empty())
        return ImmutableString();
    void* memory = Allocator::Allocate(sizeof(SharedBuffer) + inText.size() + 1);
    SharedBuffer* shared = new (memory) SharedBuffer();
    char* text = shared->Text();
    std::memcpy(text, inText.data(), inText.size());
    text[inText.size()] = '\0';
    return ImmutableString(text, inText.size(), shared);
}

void ImmutableString::AddShare(SharedBuffer* inShared) noexcept
{
    inShared->mCount.fetch_add(1, std::memory_order_relaxed);
}

void ImmutableString::Release(SharedBuffer* inShared) noexcept
{
    if (inShared->mCount.fetch_sub(1, std::memory_order_acq_rel) == 1)
    {
        inShared->~SharedBuffer();
        Allocator::Dispose(inShared);
    }
}

int ImmutableString::Compare(const ImmutableString& inOther) const noexcept
{
    if (mData == inOther.mData && mSize == inOther.mSize)
        return 0;
    return Compare(inOther.ToStringView());
}

int ImmutableString::Compare(std::string_view inOther) const noexcept
{
    const size_t common = std::min(mSize, inOther.size());
    // memcmp compares as unsigned char, which makes the order byte-wise.
    const int result = common == 0 ? 0 : std::memcmp(mData, inOther.data(), common);
    if (result != 0)
        return result < 0 ? -1 : 1;
    if (mSize == inOther.size())
        return 0;
    return mSize < inOther.size() ? -1 : 1;
}

uint32_t ImmutableString::GetShareCountForTesting() const noexcept
{
    return mShared ? mShared->mCount.load(std::memory_order_relaxed) : 0;
}

} // namespace QRT

#pragma once

// QRT::ImmutableString: an immutable, shared 8-bit (UTF-8) string. Property
// keys, match names, cutlist names and message station names are such
// strings.
//
// - CreateStatic(literal) points at the literal: no copy, no allocation. The
//   literal must outlive every copy (string literals do).
// - CreateDynamic(text) copies the text once into a reference-counted buffer
//   taken from QRT::Allocator; every copy shares that buffer.
// - Copying never allocates: a static string copies two words, a dynamic one
//   also raises the buffer's atomic count.
// - The text is always followed by a terminating zero (c_str()); the size
//   does not count it. Embedded zeros are kept by CreateDynamic.
// - Comparison (Compare, ==, <=>) is byte-wise on the text, unsigned, shorter
//   first on a common prefix; how a string was created does not matter.
//
// Thread-safe like a value: distinct copies may be used from any threads; one
// instance must not be assigned while another thread reads it.

#include <compare>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>

namespace QRT
{

class ImmutableString
{
public:
    // The empty string (no allocation).
    ImmutableString() noexcept = default;

    // A string over a literal; inLiteral must not be null (input contract).
    static ImmutableString CreateStatic(const char* inLiteral);
    // A string that owns a shared copy of inText. An empty text gives the
    // empty string without allocating.
    static ImmutableString CreateDynamic(std::string_view inText);

    // Copy, move and destruction are inline so that static text costs no
    // call; only a shared buffer's count is touched out of line.
    ImmutableString(const ImmutableString& inOther) noexcept
        : mData(inOther.mData)
        , mSize(inOther.mSize)
        , mShared(inOther.mShared)
    {
        if (mShared)
            AddShare(mShared);
    }
    ImmutableString(ImmutableString&& inOther) noexcept
        : mData(inOther.mData)
        , mSize(inOther.mSize)
        , mShared(inOther.mShared)
    {
        inOther.mData = "";
        inOther.mSize = 0;
        inOther.mShared = nullptr;
    }
    ImmutableString& operator=(const ImmutableString& inOther) noexcept
    {
        ImmutableString copy(inOther);
        Swap(copy);
        return *this;
    }
    ImmutableString& operator=(ImmutableString&& inOther) noexcept
    {
        ImmutableString moved(static_cast<ImmutableString&&>(inOther));
        Swap(moved);
        return *this;
    }
    ~ImmutableString()
    {
        if (mShared)
            Release(mShared);
    }

    void Swap(ImmutableString& ioOther) noexcept
    {
        const char* data = mData;
        const size_t size = mSize;
        SharedBuffer* shared = mShared;
        mData = ioOther.mData;
        mSize = ioOther.mSize;
        mShared = ioOther.mShared;
        ioOther.mData = data;
        ioOther.mSize = size;
        ioOther.mShared = shared;
    }

    const char* c_str() const noexcept { return mData; }
    const char* data() const noexcept { return mData; }
    size_t size() const noexcept { return mSize; }
    bool empty() const noexcept { return mSize == 0; }

    std::string_view ToStringView() const noexcept { return {mData, mSize}; }
    std::string ToStdString() const { return std::string(mData, mSize); }
    operator std::string_view() const noexcept { return ToStringView(); }

    // Negative, zero or positive as this text sorts before, equal to or after
    // inOther's.
    int Compare(const ImmutableString& inOther) const noexcept;
    int Compare(std::string_view inOther) const noexcept;

    // True when the text lives in a shared buffer made by CreateDynamic.
    bool IsDynamic() const noexcept { return mShared != nullptr; }
    // The number of strings sharing the dynamic buffer (0 for static text).
    uint32_t GetShareCountForTesting() const noexcept;

    friend bool operator==(const ImmutableString& inLeft, const ImmutableString& inRight) noexcept
    {
        return inLeft.mSize == inRight.mSize &&
               (inLeft.mData == inRight.mData || inLeft.Compare(inRight) == 0);
    }
    friend bool operator==(const ImmutableString& inLeft, std::string_view inRight) noexcept
    {
        return inLeft.ToStringView() == inRight;
    }
    friend std::strong_ordering operator<=>(const ImmutableString& inLeft,
                                            const ImmutableString& inRight) noexcept
    {
        return inLeft.Compare(inRight) <=> 0;
    }
    friend std::strong_ordering operator<=>(const ImmutableString& inLeft,
                                            std::string_view inRight) noexcept
    {
        return inLeft.Compare(inRight) <=> 0;
    }

private:
    struct SharedBuffer;

    ImmutableString(const char* inData, size_t inSize, SharedBuffer* inShared) noexcept
        : mData(inData)
        , mSize(inSize)
        , mShared(inShared)
    {
    }

    static void AddShare(SharedBuffer* inShared) noexcept;
    static void Release(SharedBuffer* inShared) noexcept;

    const char* mData = "";
    size_t mSize = 0;
    // The dynamic buffer that mData points into; null for static text.
    SharedBuffer* mShared = nullptr;
};

} // namespace QRT

template <>
struct std::hash<QRT::ImmutableString>
{
    size_t operator()(const QRT::ImmutableString& inString) const noexcept
    {
        return std::hash<std::string_view>{}(inString.ToStringView());
    }
};

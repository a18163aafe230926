// Finding the line of a JSON value for timeline messages (TimelineLines.h).

#include "TimelineLines.h"

#include <iterator>
#include <vector>

#include <nlohmann/json.hpp>

namespace BE::timeline
{
namespace
{

// The line of the last character the parser consumed. The parser reads
// one character past a number, so the line of the last character (not the
// line after it) is the value's line even when a newline follows.
struct LineState
{
    int mLine = 1;
    int mLineOfLast = 1;
};

class LineCountingIterator
{
public:
    using iterator_category = std::forward_iterator_tag;
    using value_type = char;
    using difference_type = std::ptrdiff_t;
    using pointer = const char*;
    using reference = const char&;

    LineCountingIterator(const char* inPosition, LineState* inState)
        : mPosition(inPosition)
        , mState(inState)
    {
    }

    reference operator*() const { return *mPosition; }
    LineCountingIterator& operator++()
    {
        mState->mLineOfLast = mState->mLine;
        if (*mPosition == '\n')
            ++mState->mLine;
        ++mPosition;
        return *this;
    }
    LineCountingIterator operator++(int)
    {
        LineCountingIterator before = *this;
        ++*this;
        return before;
    }
    friend bool operator==(const LineCountingIterator& inLeft, const LineCountingIterator& inRight)
    {
        return inLeft.mPosition == inRight.mPosition;
    }

private:
    const char* mPosition;
    LineState* mState;
};

// Follows the path of every value and stops at the wanted one.
class PointerFinder : public nlohmann::json_sax<nlohmann::json>
{
public:
    PointerFinder(const std::string& inTarget, const LineState& inState)
        : mTarget(inTarget)
        , mState(inState)
    {
    }

    std::optional<int> mFound;

    bool null() override { return Value(); }
    bool boolean(bool) override { return Value(); }
    bool number_integer(number_integer_t) override { return Value(); }
    bool number_unsigned(number_unsigned_t) override { return Value(); }
    bool number_float(number_float_t, const string_t&) override { return Value(); }
    bool string(string_t&) override { return Value(); }
    bool binary(binary_t&) override { return Value(); }
    bool start_object(std::size_t) override { return Open(false); }
    bool start_array(std::size_t) override { return Open(true); }
    bool end_object() override { return Close(); }
    bool end_array() override { return Close(); }
    bool key(string_t& inKey) override
    {
        mFrames.back().mKey = inKey;
        return true;
    }
    bool parse_error(std::size_t, const std::string&, const nlohmann::detail::exception&) override
    {
        return false;
    }

private:
    struct Frame
    {
        std::string mPath;
        bool mArray = false;
        std::size_t mIndex = 0;
        std::string mKey;
    };

    std::string CurrentPath()
    {
        if (mFrames.empty())
            return "";
        Frame& frame = mFrames.back();
        if (frame.mArray)
            return ChildPath(frame.mPath, frame.mIndex++);
        return ChildPath(frame.mPath, frame.mKey);
    }

    // False (stop) once the wanted value has been reached.
    bool Value()
    {
        if (CurrentPath() != mTarget)
            return true;
        mFound = mState.mLineOfLast;
        return false;
    }

    bool Open(bool inArray)
    {
        std::string path = CurrentPath();
        if (path == mTarget)
        {
            mFound = mState.mLineOfLast;
            return false;
        }
        mFrames.push_back({std::move(path), inArray, 0, {}});
        return true;
    }

    bool Close()
    {
        mFrames.pop_back();
        return true;
    }

    const std::string& mTarget;
    const LineState& mState;
    std::vector<Frame> mFrames;
};

} // namespace

std::string ChildPath(const std::string& inPath, std::string_view inKey)
{
    std::string path = inPath + "/";
    for (const char c : inKey)
    {
        if (c == '~')
            path += "~0";
        else if (c == '/')
            path += "~1";
        else
            path += c;
    }
    return path;
}

std::string ChildPath(const std::string& inPath, std::size_t inIndex)
{
    return inPath + "/" + std::to_string(inIndex);
}

std::optional<int> FindLineOfValue(std::string_view inText, const std::string& inPointer)
{
    LineState state;
    PointerFinder finder(inPointer, state);
    const LineCountingIterator first(inText.data(), &state);
    const LineCountingIterator last(inText.data() + inText.size(), &state);
    nlohmann::json::sax_parse(first, last, &finder);
    return finder.mFound;
}

void LineAndColumn(std::string_view inText, std::size_t inOffset, int& outLine, int& outColumn)
{
    outLine = 1;
    outColumn = 1;
    for (std::size_t i = 0; i < inOffset && i < inText.size(); ++i)
    {
        if (inText[i] == '\n')
        {
            ++outLine;
            outColumn = 1;
        }
        else
            ++outColumn;
    }
}

} // namespace BE::timeline

#include "CutlistInfo.h"

#include "ML/IMutableCutlist.h"
#include "ML/RenderFlags.h"
#include "ML/RenderableNodes.h"
#include "QRT/ImmutableString.h"

#include <charconv>
#include <cinttypes>
#include <set>

namespace vrender
{
namespace
{

namespace mt = mvxmediatypes;

std::string Indent(int inDepth)
{
    return std::string(static_cast<std::size_t>(2 * inDepth), ' ');
}

// A property's printed value: colours (keys ending in "Color", stored as
// the decimal of a 32-bit ARGB word) as 0xAARRGGBB, anything else quoted.
std::string PropertyText(std::string_view inKey, const std::string& inValue)
{
    std::uint32_t color = 0;
    const char* end = inValue.data() + inValue.size();
    const auto [ptr, error] = std::from_chars(inValue.data(), end, color);
    if (inKey.ends_with("Color") && !inValue.empty() && error == std::errc() && ptr == end)
        return FormatColor(color);
    return "\"" + inValue + "\"";
}

void DescribeNode(const QRT::InterfaceRef<MF::IRenderableNode>& inNode, int inDepth,
                  std::string& ioText)
{
    const std::string pad = Indent(inDepth);
    if (!inNode)
    {
        ioText += pad + "(empty)\n";
        return;
    }
    ioText += pad + std::string(inNode->GetNodeType().ToStringView()) + " " +
              inNode->GetNodeHash().ToString() + "\n";
    ioText += pad + "  flags " + FormatRenderFlags(inNode->GetRenderFlags()) + "\n";

    MF::RenderablePropertyMap properties;
    inNode->GetProperties(properties);
    if (properties.empty())
        ioText += pad + "  properties: none\n";
    else
    {
        ioText += pad + "  properties:\n";
        for (const auto& [key, value] : properties)
            ioText += pad + "    " + std::string(key.ToStringView()) + " = " +
                      PropertyText(key.ToStringView(), value) + "\n";
    }

    const std::uint32_t inputs = inNode->GetInputCount();
    if (inputs == 0)
        ioText += pad + "  inputs: none\n";
    for (std::uint32_t i = 0; i < inputs; ++i)
    {
        mt::TickTime offset = mt::kTime_Zero;
        QRT::InterfaceRef<MF::IRenderableNode> input;
        if (QRT::Failed(inNode->GetInput(i, offset, input)))
            continue;
        ioText += pad + "  input " + std::to_string(i) + " at " + FormatTime(offset) + ":\n";
        DescribeNode(input, inDepth + 2, ioText);
    }

    const std::uint32_t operators = inNode->GetOperatorCount();
    if (operators == 0)
        ioText += pad + "  operators: none\n";
    for (std::uint32_t i = 0; i < operators; ++i)
    {
        QRT::InterfaceRef<MF::IRenderableNode> op;
        if (QRT::Failed(inNode->GetOperator(i, op)))
            continue;
        ioText += pad + "  operator " + std::to_string(i) + ":\n";
        DescribeNode(op, inDepth + 2, ioText);
    }
}

} // namespace

QRT::InterfaceRef<MF::IRenderableCutlist> CreateExampleCutlist()
{
    const mt::TickTime second = mt::TickTime::TicksToTime(mt::kTicksPerSecond);
    QRT::InterfaceRef<ML::IMutableCutlist> cutlist =
        ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic("Example"));
    cutlist->AddSegment(mt::kTime_Zero, second * 2, mt::kTime_Zero,
                        ML::CreateSolidColorNode(0xFFFF0000u));
    cutlist->AddSegment(second * 2, second * 4, mt::kTime_Zero,
                        ML::CreateDisabledNode(ML::CreateSolidColorNode(0xFF00FF00u), second));
    cutlist->AddSegment(second * 4, second * 6, second, ML::CreateSolidColorNode(0xFF0000FFu));
    cutlist->MakeImmutable();
    return cutlist;
}

std::string DescribeCutlist(const MF::IRenderableCutlist& inCutlist)
{
    const std::size_t count = inCutlist.GetSegmentCount();
    std::string text = "Cutlist \"" + std::string(inCutlist.GetName().ToStringView()) + "\" " +
                       inCutlist.GetCutlistHash().ToString() + "\n";
    text += std::to_string(count) + (count == 1 ? " segment:\n" : " segments:\n");
    std::vector<QRT::Guid> trees;
    std::set<QRT::Guid> seen;
    for (std::size_t i = 0; i < count; ++i)
    {
        mt::TickTime start;
        mt::TickTime end;
        mt::TickTime offset;
        QRT::Guid hash;
        if (QRT::Failed(inCutlist.GetSegment(i, start, end, offset, hash)))
            continue;
        text += "  [" + std::to_string(i) + "] " + FormatTime(start) + " to " + FormatTime(end) +
                ", offset " + FormatTime(offset) + ", node " + hash.ToString() + "\n";
        if (seen.insert(hash).second)
            trees.push_back(hash);
    }
    text += "Node trees:\n";
    for (const QRT::Guid& hash : trees)
    {
        QRT::InterfaceRef<MF::IRenderableNode> node;
        if (QRT::Failed(inCutlist.GetNodeByHash(hash, node)))
        {
            text += "  " + hash.ToString() + ": missing from the cutlist\n";
            continue;
        }
        DescribeNode(node, 1, text);
    }
    return text;
}

std::string FormatTime(mt::TickTime inTime)
{
    if (inTime == mt::kTime_Max)
        return "end";
    if (inTime == mt::kTime_Min)
        return "start";
    if (inTime == mt::kTime_Invalid)
        return "invalid";
    char text[48];
    std::snprintf(text, sizeof(text), "%.3f s", inTime.ToSeconds());
    return text;
}

std::string FormatColor(std::uint32_t inColor)
{
    char text[16];
    std::snprintf(text, sizeof(text), "0x%08" PRIX32, inColor);
    return text;
}

std::string FormatRenderFlags(std::uint32_t inFlags)
{
    struct Named
    {
        std::uint32_t mBit;
        const char* mName;
    };
    static constexpr Named kNames[] = {
        {ML::kRenderFlag_Opaque, "Opaque"},
        {ML::kRenderFlag_TimeInvariant, "TimeInvariant"},
        {ML::kRenderFlag_NoLayerInputs, "NoLayerInputs"},
    };
    char value[16];
    std::snprintf(value, sizeof(value), "0x%08" PRIX32, inFlags);
    std::string names;
    for (std::uint32_t bit = 1; bit != 0; bit <<= 1)
    {
        if ((inFlags & bit) == 0)
            continue;
        std::string name = std::to_string(bit);
        for (const Named& named : kNames)
            if (named.mBit == bit)
                name = named.mName;
        names += names.empty() ? name : ", " + name;
    }
    return names.empty() ? std::string(value) : std::string(value) + " (" + names + ")";
}

} // namespace vrender

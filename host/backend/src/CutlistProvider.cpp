// CutlistProvider: the host's MF::IRenderableCutlistProvider (BE::CreateCutlistProvider).

#include "BE/CutlistProvider.h"

#include "QRT/Allocated.h"
#include "mvxcore/debug/Contract.h"

#include <map>
#include <mutex>
#include <shared_mutex>

namespace BE
{
namespace
{

// Rejects, with a contract error, descriptions a renderer could not use.
void CheckSettings(const CutlistProviderSettings& inSettings)
{
    MVX_INPUT_CONTRACT(inSettings.mRight >= inSettings.mLeft);
    MVX_INPUT_CONTRACT(inSettings.mBottom >= inSettings.mTop);
    MVX_INPUT_CONTRACT(inSettings.mFieldType >= mvxmediatypes::kFieldType_Progressive &&
                       inSettings.mFieldType <= mvxmediatypes::kFieldType_AsSource);
    MVX_INPUT_CONTRACT(inSettings.mPixelAspectRatio.IsValid());
}

// A sequence's cutlists by name and the description of its picture. Shared
// by the host and the renderable sources made from it; any thread. Readers
// share mLock, setters hold it alone, so every answer is one consistent
// value.
class CutlistProvider
    : public QRT::Implements<ICutlistProvider, MF::IRenderableCutlistProviderProperties>
{
public:
    explicit CutlistProvider(const CutlistProviderSettings& inSettings)
        : mSettings((CheckSettings(inSettings), inSettings))
    {
    }

    QRT::InterfaceRef<MF::IRenderableCutlist> GetMainCutlist(const QRT::ImmutableString& inName,
                                                             bool /*inFlag*/) override
    {
        return Find(inName, &CutlistSet::mMain);
    }

    QRT::InterfaceRef<MF::IRenderableCutlist>
    GetAlternateCutlist(const QRT::ImmutableString& inName, bool /*inFlag*/) override
    {
        return Find(inName, &CutlistSet::mAlternate);
    }

    QRT::InterfaceRef<MF::IRenderableCutlist> GetThirdCutlist(const QRT::ImmutableString& inName,
                                                              bool /*inFlag*/) override
    {
        return Find(inName, &CutlistSet::mThird);
    }

    void SetSettings(const CutlistProviderSettings& inSettings) override
    {
        // Checked before the lock: a rejected description changes nothing.
        CheckSettings(inSettings);
        std::unique_lock lock(mLock);
        mSettings = inSettings;
    }

    CutlistProviderSettings GetSettings() const override
    {
        std::shared_lock lock(mLock);
        return mSettings;
    }

    void SetCutlists(const QRT::ImmutableString& inName, const CutlistSet& inCutlists) override
    {
        std::unique_lock lock(mLock);
        mCutlists[inName] = inCutlists;
    }

    void RemoveCutlists(const QRT::ImmutableString& inName) override
    {
        // The released cutlists may run long destructors: drop them unlocked.
        CutlistSet removed;
        {
            std::unique_lock lock(mLock);
            const auto found = mCutlists.find(inName);
            if (found == mCutlists.end())
                return;
            removed = std::move(found->second);
            mCutlists.erase(found);
        }
    }

    void GetBounds(std::int32_t& outLeft, std::int32_t& outTop, std::int32_t& outRight,
                   std::int32_t& outBottom) const override
    {
        std::shared_lock lock(mLock);
        outLeft = mSettings.mLeft;
        outTop = mSettings.mTop;
        outRight = mSettings.mRight;
        outBottom = mSettings.mBottom;
    }

    mvxmediatypes::PixelAspectRatio GetPixelAspectRatio() const override
    {
        std::shared_lock lock(mLock);
        return mSettings.mPixelAspectRatio;
    }

    mvxmediatypes::FieldType GetFieldType() const override
    {
        std::shared_lock lock(mLock);
        return mSettings.mFieldType;
    }

    mvxmediatypes::FrameRate GetFrameRate() const override
    {
        std::shared_lock lock(mLock);
        return mSettings.mFrameRate;
    }

private:
    // The cutlist of inName, falling back to the default set of the empty
    // name when inName has no set of its own.
    QRT::InterfaceRef<MF::IRenderableCutlist>
    Find(const QRT::ImmutableString& inName,
         QRT::InterfaceRef<MF::IRenderableCutlist> CutlistSet::*inWhich) const
    {
        std::shared_lock lock(mLock);
        auto found = mCutlists.find(inName);
        if (found == mCutlists.end())
            found = mCutlists.find(QRT::ImmutableString());
        if (found == mCutlists.end())
            return {};
        return found->second.*inWhich;
    }

    mutable std::shared_mutex mLock;
    CutlistProviderSettings mSettings;
    std::map<QRT::ImmutableString, CutlistSet> mCutlists;
};

} // namespace

QRT::InterfaceRef<ICutlistProvider> CreateCutlistProvider(const CutlistProviderSettings& inSettings)
{
    return QRT::Allocated<CutlistProvider>::Create<ICutlistProvider>(inSettings);
}

} // namespace BE

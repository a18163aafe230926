#include "QRT/ClassFactory.h"

#include "QRT/CriticalSection.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <map>
#include <memory>

namespace QRT
{
namespace
{

struct ClassEntry
{
    ClassInfo mInfo;
    ClassCreateFunction mCreate;
    ClassCategoriesFunction mCategories;
    // Orders classes within a category by registration.
    uint64_t mSequence = 0;
};

// The process-wide table. Entries are shared so that a callback can run
// after the lock is left even if the class is unregistered meanwhile.
class ClassTable
{
public:
    static ClassTable& Get()
    {
        // Never destroyed: classes may be created or unregistered by other
        // static destructors at exit.
        static ClassTable* sTable = new ClassTable();
        return *sTable;
    }

    // Guards every member below.
    CriticalSection mLock;
    std::map<Guid, std::shared_ptr<const ClassEntry>> mByID;
    std::map<ImmutableString, std::shared_ptr<const ClassEntry>, std::less<>> mByName;
    uint64_t mNextSequence = 0;

    std::shared_ptr<const ClassEntry> FindByID(const Guid& inClassID)
    {
        CriticalSectionLock lock(mLock, "ClassFactory::FindByID");
        const auto found = mByID.find(inClassID);
        return found == mByID.end() ? nullptr : found->second;
    }

    std::shared_ptr<const ClassEntry> FindByName(std::string_view inClassName)
    {
        CriticalSectionLock lock(mLock, "ClassFactory::FindByName");
        const auto found = mByName.find(inClassName);
        return found == mByName.end() ? nullptr : found->second;
    }
};

Result CreateFromEntry(const std::shared_ptr<const ClassEntry>& inEntry,
                       InterfaceRef<QRTUnknown>& outObject)
{
    outObject.Reset();
    if (!inEntry)
        return kResult_NotFound;
    InterfaceRef<QRTUnknown> object;
    inEntry->mCreate(object);
    if (!object)
        return kResult_NoInterface;
    outObject = std::move(object);
    return kResult_Success;
}

} // namespace

Result ClassFactory::RegisterQRTClass(const Guid& inClassID, const ImmutableString& inClassName,
                                      const ImmutableString& inCategory,
                                      ClassCreateFunction inCreate,
                                      ClassCategoriesFunction inCategories)
{
    MVX_INPUT_CONTRACT(!inClassID.IsNil());
    MVX_INPUT_CONTRACT(!inClassName.empty());
    MVX_INPUT_CONTRACT(!inCategory.empty());
    MVX_INPUT_CONTRACT(inCreate != nullptr);

    auto entry = std::make_shared<ClassEntry>();
    entry->mInfo = ClassInfo{inClassID, inClassName, inCategory};
    entry->mCreate = std::move(inCreate);
    entry->mCategories = std::move(inCategories);

    ClassTable& table = ClassTable::Get();
    CriticalSectionLock lock(table.mLock, "ClassFactory::RegisterQRTClass");
    if (table.mByID.count(inClassID) != 0 || table.mByName.count(inClassName) != 0)
        return kResult_AlreadyExists;
    entry->mSequence = table.mNextSequence++;
    table.mByID.emplace(inClassID, entry);
    table.mByName.emplace(inClassName, std::move(entry));
    return kResult_Success;
}

Result ClassFactory::UnregisterQRTClass(const Guid& inClassID)
{
    std::shared_ptr<const ClassEntry> removed;
    {
        ClassTable& table = ClassTable::Get();
        CriticalSectionLock lock(table.mLock, "ClassFactory::UnregisterQRTClass");
        const auto found = table.mByID.find(inClassID);
        if (found == table.mByID.end())
            return kResult_NotFound;
        removed = std::move(found->second);
        table.mByID.erase(found);
        table.mByName.erase(removed->mInfo.mClassName);
    }
    // The callbacks (and whatever they captured) are destroyed here, outside
    // the lock, unless a creation still uses them.
    return kResult_Success;
}

bool ClassFactory::IsClassRegistered(const Guid& inClassID)
{
    return ClassTable::Get().FindByID(inClassID) != nullptr;
}

std::optional<ClassInfo> ClassFactory::FindClass(const Guid& inClassID)
{
    const auto entry = ClassTable::Get().FindByID(inClassID);
    if (!entry)
        return std::nullopt;
    return entry->mInfo;
}

std::optional<ClassInfo> ClassFactory::FindClassByName(std::string_view inClassName)
{
    const auto entry = ClassTable::Get().FindByName(inClassName);
    if (!entry)
        return std::nullopt;
    return entry->mInfo;
}

Result ClassFactory::CreateInstance(const Guid& inClassID, InterfaceRef<QRTUnknown>& outObject)
{
    return CreateFromEntry(ClassTable::Get().FindByID(inClassID), outObject);
}

Result ClassFactory::CreateInstanceByName(std::string_view inClassName,
                                          InterfaceRef<QRTUnknown>& outObject)
{
    return CreateFromEntry(ClassTable::Get().FindByName(inClassName), outObject);
}

Result ClassFactory::GetClassCategories(const Guid& inClassID, ClassCategoryList& outCategories)
{
    const auto entry = ClassTable::Get().FindByID(inClassID);
    if (!entry)
        return kResult_NotFound;
    if (entry->mCategories)
    {
        ClassCategoryList categories;
        const Result result = entry->mCategories(categories);
        if (Succeeded(result))
            outCategories = std::move(categories);
        return result;
    }
    outCategories = {ClassCategory{entry->mInfo.mCategory, {entry->mInfo.mClassID}}};
    return kResult_Success;
}

Result QRTGetClassCategories(ClassCategoryList& outCategories)
{
    std::vector<std::shared_ptr<const ClassEntry>> entries;
    {
        ClassTable& table = ClassTable::Get();
        CriticalSectionLock lock(table.mLock, "QRTGetClassCategories");
        entries.reserve(table.mByID.size());
        for (const auto& [id, entry] : table.mByID)
            entries.push_back(entry);
    }
    std::map<ImmutableString, std::vector<const ClassEntry*>> byCategory;
    for (const auto& entry : entries)
        byCategory[entry->mInfo.mCategory].push_back(entry.get());

    ClassCategoryList categories;
    categories.reserve(byCategory.size());
    for (auto& [category, members] : byCategory)
    {
        std::sort(members.begin(), members.end(),
                  [](const ClassEntry* inLeft, const ClassEntry* inRight)
                  { return inLeft->mSequence < inRight->mSequence; });
        ClassCategory item{category, {}};
        item.mClassIDs.reserve(members.size());
        for (const ClassEntry* member : members)
            item.mClassIDs.push_back(member->mInfo.mClassID);
        categories.push_back(std::move(item));
    }
    outCategories = std::move(categories);
    return kResult_Success;
}

ClassCategoryList QRTGetClassCategories()
{
    ClassCategoryList categories;
    QRTGetClassCategories(categories);
    return categories;
}

} // namespace QRT

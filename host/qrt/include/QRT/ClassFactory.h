#pragma once

// QRT::ClassFactory: the process-wide table of creatable classes, reached by
// class identifier or class name.
//
// A class is registered with its identifier, its name, the name of its
// category and two callbacks:
//   - the creation callback constructs an object and stores its root
//     interface (QRT::QRTUnknown) in the out-reference; it may throw (for
//     example InterfaceNotFoundException when the new object does not answer
//     its root), and the exception reaches the caller of the creation;
//   - the optional categories callback answers the category list of the
//     class; a module typically forwards it to QRTGetClassCategories. Without
//     one, the class's categories are its registered category alone.
//
// Registration and unregistration answer statuses: a second registration of
// a class identifier, or of a class name already used by another class,
// answers kResult_AlreadyExists and leaves the first registration in place.
// A nil identifier, an empty name or category, or an empty creation callback
// is an input contract violation.
//
// All functions are thread-safe. Callbacks are called without the table's
// lock held, so a creation callback may itself create or register classes;
// a class unregistered while one of its creations runs finishes that
// creation.

#include "QRT/Guid.h"
#include "QRT/ImmutableString.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"

#include <functional>
#include <optional>
#include <string_view>
#include <vector>

namespace QRT
{

// One category with the identifiers of its classes.
struct ClassCategory
{
    ImmutableString mCategory;
    std::vector<Guid> mClassIDs;
};
using ClassCategoryList = std::vector<ClassCategory>;

using ClassCreateFunction = std::function<void(InterfaceRef<QRTUnknown>& outObject)>;
using ClassCategoriesFunction = std::function<Result(ClassCategoryList& outCategories)>;

// What the factory knows of one registered class.
struct ClassInfo
{
    Guid mClassID;
    ImmutableString mClassName;
    ImmutableString mCategory;
};

class ClassFactory
{
public:
    static Result RegisterQRTClass(const Guid& inClassID, const ImmutableString& inClassName,
                                   const ImmutableString& inCategory, ClassCreateFunction inCreate,
                                   ClassCategoriesFunction inCategories = {});
    // kResult_NotFound when the class is not registered.
    static Result UnregisterQRTClass(const Guid& inClassID);

    static bool IsClassRegistered(const Guid& inClassID);
    static std::optional<ClassInfo> FindClass(const Guid& inClassID);
    static std::optional<ClassInfo> FindClassByName(std::string_view inClassName);

    // Creates an instance and stores its root in outObject. kResult_NotFound
    // (outObject emptied) for an unknown class; kResult_NoInterface when the
    // creation callback produced nothing. Exceptions of the callback propagate.
    static Result CreateInstance(const Guid& inClassID, InterfaceRef<QRTUnknown>& outObject);
    static Result CreateInstanceByName(std::string_view inClassName,
                                       InterfaceRef<QRTUnknown>& outObject);

    // The categories of one class: its categories callback's answer, or its
    // registered category alone. kResult_NotFound for an unknown class.
    static Result GetClassCategories(const Guid& inClassID, ClassCategoryList& outCategories);
};

// Every category of the registered classes, in category name order, each
// with the identifiers of its classes in registration order. Always answers
// kResult_Success; outCategories is replaced.
Result QRTGetClassCategories(ClassCategoryList& outCategories);
ClassCategoryList QRTGetClassCategories();

// A new instance of the class through interface T; empty when the class is
// unknown or its object does not implement T.
template <class T>
InterfaceRef<T> CreateClassInstanceRef(const Guid& inClassID)
{
    InterfaceRef<QRTUnknown> object;
    if (Failed(ClassFactory::CreateInstance(inClassID, object)))
        return {};
    return QueryRef<T>(object);
}

template <class T>
InterfaceRef<T> CreateClassInstanceRefByName(std::string_view inClassName)
{
    InterfaceRef<QRTUnknown> object;
    if (Failed(ClassFactory::CreateInstanceByName(inClassName, object)))
        return {};
    return QueryRef<T>(object);
}

} // namespace QRT

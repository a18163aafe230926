#include "QRT/ClassFactory.h"

#include "QRT/Allocated.h"
#include "mvxcore/config/Error.h"

#include <vector>

#include <gtest/gtest.h>

namespace
{

using QRT::ClassFactory;

class IGreeter : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{8d1f7a52-3b0e-4c61-9e2d-5a7b3c9f0e11}");
    virtual int Greet() const = 0;
};

class IUnrelated : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{8d1f7a52-3b0e-4c61-9e2d-5a7b3c9f0e12}");
};

class Greeter : public QRT::Implements<IGreeter>
{
public:
    explicit Greeter(int inValue)
        : mValue(inValue)
    {
    }
    int Greet() const override { return mValue; }

private:
    int mValue;
};

// The creation callback as modules write it: construct, ask for the root,
// store it, throw when the root is missing.
QRT::ClassCreateFunction MakeGreeterCreator(int inValue)
{
    return [inValue](QRT::InterfaceRef<QRT::QRTUnknown>& outObject)
    {
        QRT::InterfaceRef<QRT::QRTUnknown> root =
            QRT::Allocated<Greeter>::Create<QRT::QRTUnknown>(inValue);
        if (!root)
            throw QRT::InterfaceNotFoundException();
        outObject = root;
    };
}

const QRT::Guid kGreeterA("{11111111-2222-4333-8444-000000000001}");
const QRT::Guid kGreeterB("{11111111-2222-4333-8444-000000000002}");
const QRT::Guid kGreeterC("{11111111-2222-4333-8444-000000000003}");
const QRT::Guid kUnknown("{11111111-2222-4333-8444-0000000000ff}");

QRT::ImmutableString Text(const char* inText)
{
    return QRT::ImmutableString::CreateStatic(inText);
}

QRT::Result Register(const QRT::Guid& inID, const char* inName, QRT::ClassCreateFunction inCreate,
                     const char* inCategory = "Greeters")
{
    return ClassFactory::RegisterQRTClass(inID, Text(inName), Text(inCategory),
                                          std::move(inCreate));
}

int GreetingOf(const char* inName)
{
    const auto greeter = QRT::CreateClassInstanceRefByName<IGreeter>(inName);
    return greeter ? greeter->Greet() : -1;
}

// Every case unregisters its classes and must leave no allocator block behind.
class ClassFactoryTest : public ::testing::Test
{
protected:
    void SetUp() override { mBlocksBefore = QRT::Allocator::GetLiveBlockCount(); }
    void TearDown() override
    {
        for (const QRT::Guid& id : {kGreeterA, kGreeterB, kGreeterC})
            ClassFactory::UnregisterQRTClass(id);
        EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), mBlocksBefore);
    }
    int64_t mBlocksBefore = 0;
};

TEST_F(ClassFactoryTest, RegisteredClassIsCreatedByIdentifierAndNameUntilUnregistered)
{
    ASSERT_EQ(Register(kGreeterA, "GreeterA", MakeGreeterCreator(7)), QRT::kResult_Success);
    const QRT::InterfaceRef<IGreeter> byID = QRT::CreateClassInstanceRef<IGreeter>(kGreeterA);
    ASSERT_TRUE(byID);
    EXPECT_EQ(byID->Greet(), 7);
    EXPECT_EQ(GreetingOf("GreeterA"), 7);
    EXPECT_EQ(ClassFactory::FindClassByName("GreeterA")->mClassID, kGreeterA);

    // A taken identifier or name is refused and the first class kept.
    EXPECT_EQ(Register(kGreeterA, "Other", MakeGreeterCreator(2)), QRT::kResult_AlreadyExists);
    EXPECT_EQ(Register(kGreeterB, "GreeterA", MakeGreeterCreator(3)), QRT::kResult_AlreadyExists);
    EXPECT_EQ(GreetingOf("GreeterA"), 7);

    EXPECT_EQ(ClassFactory::UnregisterQRTClass(kGreeterA), QRT::kResult_Success);
    EXPECT_EQ(ClassFactory::UnregisterQRTClass(kGreeterA), QRT::kResult_NotFound);
    EXPECT_FALSE(ClassFactory::FindClassByName("GreeterA"));
    // The name is free again.
    EXPECT_EQ(Register(kGreeterB, "GreeterA", MakeGreeterCreator(2)), QRT::kResult_Success);
    EXPECT_EQ(GreetingOf("GreeterA"), 2);
}

TEST_F(ClassFactoryTest, FailedCreationsAnswerEmptyOrTheirStatus)
{
    EXPECT_EQ(GreetingOf("NoSuchClass"), -1);
    QRT::InterfaceRef<QRT::QRTUnknown> out = QRT::Allocated<Greeter>::Create<QRT::QRTUnknown>(1);
    EXPECT_EQ(ClassFactory::CreateInstance(kUnknown, out), QRT::kResult_NotFound);
    EXPECT_FALSE(out);

    // An instance without the interface is released (TearDown counts it).
    ASSERT_EQ(Register(kGreeterA, "GreeterA", MakeGreeterCreator(1)), QRT::kResult_Success);
    EXPECT_FALSE(QRT::CreateClassInstanceRef<IUnrelated>(kGreeterA));
    ASSERT_EQ(Register(kGreeterB, "GreeterB", [](QRT::InterfaceRef<QRT::QRTUnknown>&) {}),
              QRT::kResult_Success);
    EXPECT_EQ(ClassFactory::CreateInstance(kGreeterB, out), QRT::kResult_NoInterface);
    EXPECT_FALSE(QRT::CreateClassInstanceRef<IGreeter>(kGreeterB));
    ASSERT_EQ(Register(kGreeterC, "GreeterC",
                       [](QRT::InterfaceRef<QRT::QRTUnknown>&)
                       { throw QRT::InterfaceNotFoundException(); }),
              QRT::kResult_Success);
    EXPECT_THROW(QRT::CreateClassInstanceRef<IGreeter>(kGreeterC), QRT::InterfaceNotFoundException);
}

TEST_F(ClassFactoryTest, CategoriesListTheirClassesInRegistrationOrderOrComeFromTheCallback)
{
    ASSERT_EQ(Register(kGreeterC, "GreeterC", MakeGreeterCreator(3), "Zeta"), QRT::kResult_Success);
    ASSERT_EQ(Register(kGreeterB, "GreeterB", MakeGreeterCreator(2), "Alpha"),
              QRT::kResult_Success);
    ASSERT_EQ(ClassFactory::RegisterQRTClass(kGreeterA, Text("GreeterA"), Text("Zeta"),
                                             MakeGreeterCreator(1),
                                             [](QRT::ClassCategoryList& outCategories)
                                             { return QRT::QRTGetClassCategories(outCategories); }),
              QRT::kResult_Success);

    const QRT::ClassCategoryList categories = QRT::QRTGetClassCategories();
    std::vector<std::vector<QRT::Guid>> ours;
    for (const QRT::ClassCategory& category : categories)
        if (category.mCategory == "Alpha" || category.mCategory == "Zeta")
            ours.push_back(category.mClassIDs);
    EXPECT_EQ(ours, (std::vector<std::vector<QRT::Guid>>{{kGreeterB}, {kGreeterC, kGreeterA}}));

    QRT::ClassCategoryList ofClass;
    EXPECT_EQ(ClassFactory::GetClassCategories(kGreeterB, ofClass), QRT::kResult_Success);
    ASSERT_EQ(ofClass.size(), 1u);
    EXPECT_EQ(ofClass[0].mCategory, "Alpha");
    EXPECT_EQ(ClassFactory::GetClassCategories(kUnknown, ofClass), QRT::kResult_NotFound);
    // The callback forwards to the global list.
    EXPECT_EQ(ClassFactory::GetClassCategories(kGreeterA, ofClass), QRT::kResult_Success);
    EXPECT_EQ(ofClass.size(), categories.size());
}

TEST_F(ClassFactoryTest, BadRegistrationsAreContractViolations)
{
    const QRT::ClassCreateFunction make = MakeGreeterCreator(1);
    EXPECT_THROW(Register(QRT::Guid(), "X", make, "C"), mvxcore::config::Error);
    EXPECT_THROW(Register(kGreeterA, "", make, "C"), mvxcore::config::Error);
    EXPECT_THROW(Register(kGreeterA, "X", make, ""), mvxcore::config::Error);
    EXPECT_THROW(Register(kGreeterA, "X", nullptr, "C"), mvxcore::config::Error);
    EXPECT_FALSE(ClassFactory::IsClassRegistered(kGreeterA));
}

} // namespace

#include "QRT/ClassFactory.h"

#include "QRT/Allocated.h"
#include "mvxcore/config/Error.h"

#include <algorithm>
#include <atomic>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

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

class ClassFactoryTest : public ::testing::Test
{
protected:
    void SetUp() override { mBlocksBefore = QRT::Allocator::GetLiveBlockCount(); }
    void TearDown() override
    {
        for (const QRT::Guid& id : {kGreeterA, kGreeterB, kGreeterC})
            QRT::ClassFactory::UnregisterQRTClass(id);
        EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), mBlocksBefore);
    }
    int64_t mBlocksBefore = 0;
};

TEST_F(ClassFactoryTest, RegisteredClassIsCreatedByIdentifierAndName)
{
    ASSERT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterA, Text("GreeterA"), Text("Greeters"),
                                                  MakeGreeterCreator(7)),
              QRT::kResult_Success);
    const QRT::InterfaceRef<IGreeter> byID = QRT::CreateClassInstanceRef<IGreeter>(kGreeterA);
    ASSERT_TRUE(byID);
    EXPECT_EQ(byID->Greet(), 7);
    const auto byName = QRT::CreateClassInstanceRefByName<IGreeter>("GreeterA");
    ASSERT_TRUE(byName);
    EXPECT_EQ(byName->Greet(), 7);
    // Every creation makes a new object.
    EXPECT_FALSE(byID == byName);

    const std::optional<QRT::ClassInfo> info = QRT::ClassFactory::FindClassByName("GreeterA");
    ASSERT_TRUE(info);
    EXPECT_EQ(info->mClassID, kGreeterA);
    EXPECT_EQ(info->mCategory, "Greeters");
}

TEST_F(ClassFactoryTest, SecondRegistrationIsRefusedAndKeepsTheFirst)
{
    ASSERT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterA, Text("GreeterA"), Text("Greeters"),
                                                  MakeGreeterCreator(1)),
              QRT::kResult_Success);
    EXPECT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterA, Text("Other"), Text("Greeters"),
                                                  MakeGreeterCreator(2)),
              QRT::kResult_AlreadyExists);
    EXPECT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterB, Text("GreeterA"), Text("Greeters"),
                                                  MakeGreeterCreator(3)),
              QRT::kResult_AlreadyExists);
    EXPECT_EQ(QRT::CreateClassInstanceRef<IGreeter>(kGreeterA)->Greet(), 1);
    EXPECT_FALSE(QRT::ClassFactory::IsClassRegistered(kGreeterB));
    EXPECT_FALSE(QRT::ClassFactory::FindClassByName("Other"));
}

TEST_F(ClassFactoryTest, UnknownClassGivesEmptyReference)
{
    EXPECT_FALSE(QRT::CreateClassInstanceRef<IGreeter>(kUnknown));
    EXPECT_FALSE(QRT::CreateClassInstanceRefByName<IGreeter>("NoSuchClass"));
    QRT::InterfaceRef<QRT::QRTUnknown> out = QRT::Allocated<Greeter>::Create<QRT::QRTUnknown>(1);
    EXPECT_EQ(QRT::ClassFactory::CreateInstance(kUnknown, out), QRT::kResult_NotFound);
    EXPECT_FALSE(out);
}

TEST_F(ClassFactoryTest, InstanceWithoutTheInterfaceGivesEmptyAndIsFreed)
{
    ASSERT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterA, Text("GreeterA"), Text("Greeters"),
                                                  MakeGreeterCreator(1)),
              QRT::kResult_Success);
    EXPECT_FALSE(QRT::CreateClassInstanceRef<IUnrelated>(kGreeterA));
    // TearDown's block count proves the unwanted instance was released.
}

TEST_F(ClassFactoryTest, CreatorThatProducesNothingAnswersNoInterface)
{
    ASSERT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterA, Text("GreeterA"), Text("Greeters"),
                                                  [](QRT::InterfaceRef<QRT::QRTUnknown>&) {}),
              QRT::kResult_Success);
    QRT::InterfaceRef<QRT::QRTUnknown> out;
    EXPECT_EQ(QRT::ClassFactory::CreateInstance(kGreeterA, out), QRT::kResult_NoInterface);
    EXPECT_FALSE(QRT::CreateClassInstanceRef<IGreeter>(kGreeterA));
}

TEST_F(ClassFactoryTest, CreatorExceptionReachesTheCaller)
{
    ASSERT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterA, Text("GreeterA"), Text("Greeters"),
                                                  [](QRT::InterfaceRef<QRT::QRTUnknown>&)
                                                  { throw QRT::InterfaceNotFoundException(); }),
              QRT::kResult_Success);
    EXPECT_THROW(QRT::CreateClassInstanceRef<IGreeter>(kGreeterA), QRT::InterfaceNotFoundException);
}

TEST_F(ClassFactoryTest, UnregisterRemovesTheClassOnce)
{
    ASSERT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterA, Text("GreeterA"), Text("Greeters"),
                                                  MakeGreeterCreator(1)),
              QRT::kResult_Success);
    EXPECT_EQ(QRT::ClassFactory::UnregisterQRTClass(kGreeterA), QRT::kResult_Success);
    EXPECT_EQ(QRT::ClassFactory::UnregisterQRTClass(kGreeterA), QRT::kResult_NotFound);
    EXPECT_FALSE(QRT::CreateClassInstanceRef<IGreeter>(kGreeterA));
    EXPECT_FALSE(QRT::ClassFactory::FindClassByName("GreeterA"));
    // The name is free again.
    EXPECT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterB, Text("GreeterA"), Text("Greeters"),
                                                  MakeGreeterCreator(2)),
              QRT::kResult_Success);
    EXPECT_EQ(QRT::CreateClassInstanceRefByName<IGreeter>("GreeterA")->Greet(), 2);
}

TEST_F(ClassFactoryTest, CategoriesListTheirClassesInRegistrationOrder)
{
    ASSERT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterC, Text("GreeterC"), Text("Zeta"),
                                                  MakeGreeterCreator(3)),
              QRT::kResult_Success);
    ASSERT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterB, Text("GreeterB"), Text("Alpha"),
                                                  MakeGreeterCreator(2)),
              QRT::kResult_Success);
    ASSERT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterA, Text("GreeterA"), Text("Zeta"),
                                                  MakeGreeterCreator(1)),
              QRT::kResult_Success);

    const QRT::ClassCategoryList categories = QRT::QRTGetClassCategories();
    const auto find = [&](const char* inName)
    {
        return std::find_if(categories.begin(), categories.end(),
                            [&](const QRT::ClassCategory& inCategory)
                            { return inCategory.mCategory == inName; });
    };
    const auto alpha = find("Alpha");
    const auto zeta = find("Zeta");
    ASSERT_NE(alpha, categories.end());
    ASSERT_NE(zeta, categories.end());
    EXPECT_LT(alpha, zeta);
    EXPECT_EQ(alpha->mClassIDs, std::vector<QRT::Guid>{kGreeterB});
    EXPECT_EQ(zeta->mClassIDs, (std::vector<QRT::Guid>{kGreeterC, kGreeterA}));

    QRT::ClassCategoryList ofClass;
    EXPECT_EQ(QRT::ClassFactory::GetClassCategories(kGreeterB, ofClass), QRT::kResult_Success);
    ASSERT_EQ(ofClass.size(), 1u);
    EXPECT_EQ(ofClass[0].mCategory, "Alpha");
    EXPECT_EQ(QRT::ClassFactory::GetClassCategories(kUnknown, ofClass), QRT::kResult_NotFound);
}

TEST_F(ClassFactoryTest, CategoriesCallbackMayForwardToTheGlobalList)
{
    ASSERT_EQ(QRT::ClassFactory::RegisterQRTClass(
                  kGreeterA, Text("GreeterA"), Text("Greeters"), MakeGreeterCreator(1),
                  [](QRT::ClassCategoryList& outCategories)
                  { return QRT::QRTGetClassCategories(outCategories); }),
              QRT::kResult_Success);
    QRT::ClassCategoryList viaClass;
    ASSERT_EQ(QRT::ClassFactory::GetClassCategories(kGreeterA, viaClass), QRT::kResult_Success);
    const QRT::ClassCategoryList global = QRT::QRTGetClassCategories();
    ASSERT_EQ(viaClass.size(), global.size());
    for (size_t i = 0; i < global.size(); ++i)
    {
        EXPECT_EQ(viaClass[i].mCategory, global[i].mCategory);
        EXPECT_EQ(viaClass[i].mClassIDs, global[i].mClassIDs);
    }
}

TEST_F(ClassFactoryTest, BadRegistrationsAreContractViolations)
{
    EXPECT_THROW(QRT::ClassFactory::RegisterQRTClass(QRT::Guid(), Text("X"), Text("C"),
                                                     MakeGreeterCreator(1)),
                 mvxcore::config::Error);
    EXPECT_THROW(
        QRT::ClassFactory::RegisterQRTClass(kGreeterA, Text(""), Text("C"), MakeGreeterCreator(1)),
        mvxcore::config::Error);
    EXPECT_THROW(
        QRT::ClassFactory::RegisterQRTClass(kGreeterA, Text("X"), Text(""), MakeGreeterCreator(1)),
        mvxcore::config::Error);
    EXPECT_THROW(QRT::ClassFactory::RegisterQRTClass(kGreeterA, Text("X"), Text("C"), nullptr),
                 mvxcore::config::Error);
    EXPECT_FALSE(QRT::ClassFactory::IsClassRegistered(kGreeterA));
}

TEST_F(ClassFactoryTest, CreatorMayUseTheFactory)
{
    // A creation callback runs outside the table's lock.
    ASSERT_EQ(QRT::ClassFactory::RegisterQRTClass(kGreeterB, Text("GreeterB"), Text("Greeters"),
                                                  MakeGreeterCreator(5)),
              QRT::kResult_Success);
    ASSERT_EQ(QRT::ClassFactory::RegisterQRTClass(
                  kGreeterA, Text("GreeterA"), Text("Greeters"),
                  [](QRT::InterfaceRef<QRT::QRTUnknown>& outObject)
                  {
                      QRT::ClassFactory::CreateInstance(kGreeterB, outObject);
                      QRT::ClassFactory::UnregisterQRTClass(kGreeterB);
                  }),
              QRT::kResult_Success);
    const auto made = QRT::CreateClassInstanceRef<IGreeter>(kGreeterA);
    ASSERT_TRUE(made);
    EXPECT_EQ(made->Greet(), 5);
    EXPECT_FALSE(QRT::ClassFactory::IsClassRegistered(kGreeterB));
}

TEST_F(ClassFactoryTest, ConcurrentRegistrationAndCreationStayConsistent)
{
    std::atomic<bool> stop{false};
    std::atomic<int> created{0};
    std::thread creator(
        [&]
        {
            while (!stop)
            {
                if (const auto greeter = QRT::CreateClassInstanceRef<IGreeter>(kGreeterA))
                {
                    EXPECT_EQ(greeter->Greet(), 9);
                    ++created;
                }
            }
        });
    int successes = 0;
    for (int i = 0; i < 500; ++i)
    {
        if (QRT::ClassFactory::RegisterQRTClass(kGreeterA, Text("GreeterA"), Text("Greeters"),
                                                MakeGreeterCreator(9)) == QRT::kResult_Success)
            ++successes;
        EXPECT_EQ(QRT::ClassFactory::UnregisterQRTClass(kGreeterA), QRT::kResult_Success);
    }
    stop = true;
    creator.join();
    EXPECT_EQ(successes, 500);
    EXPECT_FALSE(QRT::ClassFactory::IsClassRegistered(kGreeterA));
}

} // namespace

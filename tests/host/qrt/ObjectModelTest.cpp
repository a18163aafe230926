#include "QRT/Allocated.h"
#include "QRT/InterfaceRef.h"
#include "QRT/WeakReference.h"

#include <atomic>
#include <barrier>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

class IShape : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{0a1b2c3d-0000-4000-8000-000000000001}");
    virtual int Area() const = 0;
};

class ISquare : public IShape
{
public:
    QRT_INTERFACE_ID("{0a1b2c3d-0000-4000-8000-000000000002}");
    QRT_INTERFACE_PARENT(IShape);
    virtual int Side() const = 0;
};

class INamed : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{0a1b2c3d-0000-4000-8000-000000000003}");
    virtual const char* Name() const = 0;
};

class IUnimplemented : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{0a1b2c3d-0000-4000-8000-000000000004}");
};

std::atomic<int> sLiveObjects{0};

class Square : public QRT::Implements<ISquare, INamed>
{
public:
    explicit Square(int inSide)
        : mSide(inSide)
    {
        ++sLiveObjects;
    }
    ~Square() { --sLiveObjects; }
    int Area() const override { return mSide * mSide; }
    int Side() const override { return mSide; }
    const char* Name() const override { return "square"; }

private:
    int mSide;
};

class Thrower : public QRT::Implements<IShape>
{
public:
    Thrower() { throw std::runtime_error("no"); }
    int Area() const override { return 0; }
};

class Client : public QRT::Implements<INamed, QRT::IWeakReferenceCapable>
{
public:
    Client() { ++sLiveObjects; }
    ~Client() { --sLiveObjects; }
    const char* Name() const override { return "client"; }
};

// Every case must leave no object and no allocator block behind.
class ObjectModelTest : public ::testing::Test
{
protected:
    void SetUp() override { mBlocksBefore = QRT::Allocator::GetLiveBlockCount(); }
    void TearDown() override
    {
        EXPECT_EQ(sLiveObjects.load(), 0);
        EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), mBlocksBefore);
    }
    int64_t mBlocksBefore = 0;
};

TEST_F(ObjectModelTest, ComparisonGoesThroughRootInterfacesAndFailuresThrow)
{
    const QRT::InterfaceRef<ISquare> square = QRT::Allocated<Square>::Create<ISquare>(1);
    const QRT::InterfaceRef<ISquare> other = QRT::Allocated<Square>::Create<ISquare>(1);
    const QRT::InterfaceRef<ISquare> empty;
    EXPECT_TRUE(square == QRT::InterfaceRef<INamed>(square));
    EXPECT_FALSE(square == other);
    EXPECT_NE((square <=> other), std::strong_ordering::equal);
    EXPECT_THROW(QRT::InterfaceRef<IUnimplemented>{square}, QRT::InterfaceNotFoundException);
    EXPECT_STREQ(QRT::IllegalComparisonException().what(),
                 "A comparison of two refs has failed because we are unable to convert one of "
                 "them to QRTUnknown.");
    EXPECT_THROW((void)empty->Side(), QRT::NullInterfaceException);
    EXPECT_THROW((void)*empty, QRT::NullInterfaceException);
    // An empty reference converts to an empty one instead of throwing.
    EXPECT_FALSE(QRT::InterfaceRef<IUnimplemented>(empty));
    EXPECT_FALSE(QRT::QueryRef<IUnimplemented>(square));
    EXPECT_TRUE(QRT::QueryRef<INamed>(square));
    // Creation for an unimplemented interface frees the new object; a
    // throwing constructor returns its memory (TearDown counts both).
    EXPECT_FALSE((QRT::Allocated<Square>::Create<IUnimplemented>(1)));
    EXPECT_THROW(QRT::Allocated<Thrower>::Create<IShape>(), std::runtime_error);
}

TEST_F(ObjectModelTest, WeakReferenceLocksOnlyWhileAliveAndALockRacingTheLastReleaseNeverRevives)
{
    for (int round = 0; round < 300; ++round)
    {
        QRT::InterfaceRef<INamed> client = QRT::Allocated<Client>::Create<INamed>();
        const QRT::WeakReference<INamed> weak(client);
        EXPECT_STREQ(weak.Lock()->Name(), "client");
        std::barrier start(3);
        std::atomic<bool> released{false};
        std::vector<std::thread> lockers;
        for (int i = 0; i < 2; ++i)
        {
            lockers.emplace_back(
                [&]
                {
                    start.arrive_and_wait();
                    for (int n = 0; n < 50; ++n)
                    {
                        const bool wasReleased = released.load();
                        // A lock that succeeds must see a live object.
                        const QRT::InterfaceRef<INamed> strong = weak.Lock();
                        EXPECT_TRUE(!strong || (!(wasReleased && sLiveObjects.load() == 0) &&
                                                std::string(strong->Name()) == "client"));
                    }
                });
        }
        start.arrive_and_wait();
        client.Reset();
        released = true;
        for (auto& t : lockers)
            t.join();
        EXPECT_TRUE(weak.IsExpired());
        EXPECT_FALSE(weak.Lock());
    }
    const QRT::InterfaceRef<INamed> notWeakCapable = QRT::Allocated<Square>::Create<INamed>(1);
    EXPECT_THROW(QRT::WeakReference<INamed>{notWeakCapable}, QRT::InterfaceNotFoundException);
}

} // namespace

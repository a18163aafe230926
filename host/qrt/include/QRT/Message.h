#pragma once

// Typed messages for the messaging stations (StationRegistry.h).
//
// A message type is a copyable payload struct that names itself:
//
//     struct RenderFrameCancelledMessage
//     {
//         static constexpr std::string_view kMessageTypeName = "ML::RenderFrameCancelledMessage";
//         intptr_t mContext;
//         uint32_t mRequestID;
//     };
//     QRT::MessageImpl<RenderFrameCancelledMessage> message({context, requestID});
//
// Its message type identifier is HashMessageTypeNameToMessageID of that name,
// computed once per type and then kept. Posting clones a message through
// Clone(), which takes the copy's memory from QRT::Allocator; the clone owns
// its own copy of the payload (and so its own references).
//
// Messages are immutable once posted and may be read from any thread.

#include "QRT/Allocator.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <new>
#include <string_view>
#include <type_traits>
#include <utility>

namespace QRT
{

using MessageID = uint32_t;

// A stable 32-bit identifier for a message type name: the first
// little-endian word of the QRT::MixHash of the name's bytes (no terminating
// zero), so it is the same in every run and on every platform.
MessageID HashMessageTypeNameToMessageID(std::string_view inTypeName);

class Message;

// Frees a message made by Clone().
struct MessageDeleter
{
    void operator()(Message* inMessage) const noexcept;
};
// Owns a clone. Only Clone() makes these.
using MessagePtr = std::unique_ptr<Message, MessageDeleter>;

class Message
{
public:
    virtual ~Message() = default;

    MessageID GetMessageID() const noexcept { return mMessageID; }
    virtual std::string_view GetTypeName() const noexcept = 0;
    // A copy in memory from QRT::Allocator.
    virtual MessagePtr Clone() const = 0;

    // The payload when this is a MessageImpl<T>, else null.
    template <class T>
    const T* GetPayloadIf() const noexcept;

protected:
    explicit Message(MessageID inMessageID) noexcept
        : mMessageID(inMessageID)
    {
    }
    Message(const Message&) = default;
    Message& operator=(const Message&) = delete;

    // Destroys a clone and returns its memory.
    virtual void DestroyClone() noexcept = 0;

private:
    friend struct MessageDeleter;

    MessageID mMessageID;
};

template <class T>
concept NamedMessagePayload = std::is_copy_constructible_v<T> && requires
{
    {std::string_view(T::kMessageTypeName)};
};

template <NamedMessagePayload T>
class MessageImpl final : public Message
{
public:
    // The identifier of this message type, computed on first use.
    static MessageID GetStaticMessageID()
    {
        static const MessageID sMessageID = HashMessageTypeNameToMessageID(T::kMessageTypeName);
        return sMessageID;
    }

    explicit MessageImpl(T inPayload)
        : Message(GetStaticMessageID())
        , mPayload(std::move(inPayload))
    {
    }

    template <class... Args>
    explicit MessageImpl(std::in_place_t, Args&&... inArgs)
        : Message(GetStaticMessageID())
        , mPayload{std::forward<Args>(inArgs)...}
    {
    }

    MessageImpl(const MessageImpl&) = default;

    const T& GetPayload() const noexcept { return mPayload; }
    std::string_view GetTypeName() const noexcept override { return T::kMessageTypeName; }

    MessagePtr Clone() const override
    {
        static_assert(alignof(MessageImpl) <= alignof(std::max_align_t),
                      "over-aligned payloads are not supported by QRT::Allocator");
        void* memory = Allocator::Allocate(sizeof(MessageImpl));
        try
        {
            return MessagePtr(new (memory) MessageImpl(*this));
        }
        catch (...)
        {
            Allocator::Dispose(memory);
            throw;
        }
    }

protected:
    void DestroyClone() noexcept override
    {
        this->~MessageImpl();
        Allocator::Dispose(this);
    }

private:
    T mPayload;
};

template <class T>
const T* Message::GetPayloadIf() const noexcept
{
    // The identifier is a cheap first test; the cast makes a 32-bit collision
    // between two type names harmless.
    if (mMessageID != MessageImpl<T>::GetStaticMessageID())
        return nullptr;
    const auto* typed = dynamic_cast<const MessageImpl<T>*>(this);
    return typed ? &typed->GetPayload() : nullptr;
}

inline void MessageDeleter::operator()(Message* inMessage) const noexcept
{
    if (inMessage)
        inMessage->DestroyClone();
}

} // namespace QRT

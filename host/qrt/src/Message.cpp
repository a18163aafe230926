#include "QRT/Message.h"

#include "QRT/Hash.h"

namespace QRT
{

MessageID HashMessageTypeNameToMessageID(std::string_view inTypeName)
{
    HashValue hash;
    MixHash::MixInString(hash, inTypeName);
    return hash.GetWord(0);
}

} // namespace QRT

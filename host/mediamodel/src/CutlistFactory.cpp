#include "MF/RenderableCutlistFactory.h"
#include "QRT/CriticalSection.h"

#include <utility>

namespace MF
{
namespace
{

// Guards sPublishedFactory.
QRT::CriticalSection sFactoryLock;
// Never destroyed: a factory still published at exit belongs to a module that
// may already be unloaded, so it must not be released by static destruction.
// The module withdraws its factory at shutdown.
QRT::InterfaceRef<IRenderableCutlistFactory>& sPublishedFactory =
    *new QRT::InterfaceRef<IRenderableCutlistFactory>();

} // namespace

void SetCutlistFactory(const QRT::InterfaceRef<IRenderableCutlistFactory>& inFactory)
{
    QRT::InterfaceRef<IRenderableCutlistFactory> previous = inFactory;
    {
        QRT::CriticalSectionLock lock(sFactoryLock, "MF::SetCutlistFactory");
        sPublishedFactory.Swap(previous);
    }
    // The previous factory is released here, outside the lock: its last
    // release may run code that asks for the published factory again.
}

QRT::InterfaceRef<IRenderableCutlistFactory> GetCutlistFactory()
{
    QRT::CriticalSectionLock lock(sFactoryLock, "MF::GetCutlistFactory");
    return sPublishedFactory;
}

} // namespace MF

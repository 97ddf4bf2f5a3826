#include "core/Module.h"

namespace tavi {
namespace {

std::atomic<HINSTANCE> theInstance{nullptr};
std::atomic<std::int32_t> theRefCount{0};

} // namespace

HINSTANCE moduleInstance() noexcept
{
    return theInstance;
}

void setModuleInstance(HINSTANCE instance) noexcept
{
    theInstance = instance;
}

std::atomic<std::int32_t>& moduleRefCount() noexcept
{
    return theRefCount;
}

} // namespace tavi

#include "link/MessageBuffer.h"

#include <cstdlib>
#include <cstring>

namespace tavi {
namespace {

constexpr std::uint32_t kFirstCapacity = 1024;
constexpr std::uint32_t kHeadroom = 1024;

} // namespace

MessageBuffer::MessageBuffer() noexcept
{
    grow(kFirstCapacity);
}

MessageBuffer::~MessageBuffer()
{
    std::free(data_);
}

void MessageBuffer::ensure(std::uint32_t size) noexcept
{
    if (size > capacity_)
        grow(size > UINT32_MAX - kHeadroom ? UINT32_MAX : size + kHeadroom);
}

void MessageBuffer::grow(std::uint32_t capacity) noexcept
{
    // The last kilobyte below 4 GB has no room for the headroom: as good as refused.
    void* const block = capacity == UINT32_MAX ? nullptr : std::realloc(data_, capacity);
    if (!block)
        std::free(data_);
    data_ = static_cast<unsigned char*>(block);
    if (data_)
        std::memset(data_ + capacity_, 0, capacity - capacity_);
    capacity_ = data_ ? capacity : 0;
}

} // namespace tavi

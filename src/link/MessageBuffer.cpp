#include "link/MessageBuffer.h"

#include <cstdlib>
#include <cstring>

namespace tavi {
namespace {

constexpr std::uint32_t kInitialBytes = 1024;
constexpr std::uint32_t kHeadroomBytes = 1024;

} // namespace

MessageBuffer::MessageBuffer() noexcept
{
    grow(kInitialBytes);
}

MessageBuffer::~MessageBuffer()
{
    std::free(data_);
}

void MessageBuffer::ensure(std::uint32_t size) noexcept
{
    if (size > capacity_)
        grow(size > UINT32_MAX - kHeadroomBytes ? UINT32_MAX : size + kHeadroomBytes);
}

void MessageBuffer::grow(std::uint32_t capacity) noexcept
{
    // This capacity means that the size and its headroom exceed 4 GB.
    void* const block = capacity == UINT32_MAX ? nullptr : std::realloc(data_, capacity);
    if (!block)
        std::free(data_);
    data_ = static_cast<unsigned char*>(block);
    if (data_)
        std::memset(data_ + capacity_, 0, capacity - capacity_);
    capacity_ = data_ ? capacity : 0;
}

} // namespace tavi

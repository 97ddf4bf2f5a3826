#pragma once

#include <cstdint>

#include "core/RefCounted.h"

namespace tavi {

// A growable block for one frame. The reference count is not atomic: a buffer stays on the thread that created it.
class MessageBuffer : public RefCounted<MessageBuffer, std::uint32_t> {
  public:
    static RefPtr<MessageBuffer> create()
    {
        return RefPtr<MessageBuffer>(new MessageBuffer);
    }

    // Grows the block to at least `size` bytes. On failure the old block is freed too, and data() is null.
    void ensure(std::uint32_t size) noexcept;

    // Returns the block, null after a failed growth. All capacity() bytes can be read; new ones are 0.
    unsigned char* data() const noexcept
    {
        return data_;
    }
    std::uint32_t capacity() const noexcept
    {
        return capacity_;
    }
    // Returns the number of bytes in use. The peer announces it: it may exceed the bytes received and the capacity.
    std::uint32_t length() const noexcept
    {
        return length_;
    }
    void setLength(std::uint32_t length) noexcept
    {
        length_ = length;
    }

  private:
    friend class RefCounted<MessageBuffer, std::uint32_t>;
    MessageBuffer() noexcept;
    ~MessageBuffer();
    void grow(std::uint32_t capacity) noexcept;

    unsigned char* data_ = nullptr;
    std::uint32_t capacity_ = 0;
    std::uint32_t length_ = 0;
};

} // namespace tavi

#pragma once

#include <atomic>
#include <cstdint>
#include <type_traits>
#include <utility>

namespace tavi {

// The base of objects that RefPtr holds. The count starts at 0; the release of the last reference destroys the object.
// With an atomic count any thread may hold references, with a plain one a single thread. The methods have COM's names
// so that RefPtr holds COM interfaces too.
template <class Derived, class Count = std::atomic<std::int32_t>>
class RefCounted {
  public:
    RefCounted(const RefCounted&) = delete;
    RefCounted& operator=(const RefCounted&) = delete;

    void AddRef() const noexcept
    {
        ++references_;
    }
    void Release() const noexcept
    {
        if (--references_ < 1)
            delete static_cast<const Derived*>(this);
    }
    // Adds `count` references at once; a negative count must leave at least one.
    void addRefs(std::int32_t count) const noexcept
    {
        references_ += count;
    }

  protected:
    RefCounted() noexcept = default;
    ~RefCounted() = default;

  private:
    mutable Count references_{0};
};

// One reference to an object with AddRef and Release. A RefPtr belongs to one thread at a time; the object need not.
template <class Object>
class RefPtr {
  public:
    RefPtr() noexcept = default;
    // Adds a reference.
    explicit RefPtr(Object* object) noexcept : object_(object)
    {
        if (object_)
            object_->AddRef();
    }
    // Takes over a reference that the caller holds.
    static RefPtr adopt(Object* object) noexcept
    {
        RefPtr adopted;
        adopted.object_ = object;
        return adopted;
    }
    RefPtr(const RefPtr& other) noexcept : RefPtr(other.object_) {}
    RefPtr(RefPtr&& other) noexcept : object_(other.release()) {}
    // From a pointer to non-const or to a derived class.
    template <class Other, class = std::enable_if_t<std::is_convertible_v<Other*, Object*>>>
    RefPtr(RefPtr<Other> other) noexcept : object_(other.release())
    {
    }
    RefPtr& operator=(RefPtr other) noexcept
    {
        std::swap(object_, other.object_);
        return *this;
    }
    ~RefPtr()
    {
        if (object_)
            object_->Release();
    }

    Object* get() const noexcept
    {
        return object_;
    }
    Object* operator->() const noexcept
    {
        return object_;
    }
    Object& operator*() const noexcept
    {
        return *object_;
    }
    explicit operator bool() const noexcept
    {
        return object_ != nullptr;
    }
    // Passes the reference to the caller, who releases it.
    [[nodiscard]] Object* release() noexcept
    {
        return std::exchange(object_, nullptr);
    }
    void reset() noexcept
    {
        *this = RefPtr();
    }
    // For COM functions that store a new reference through a pointer.
    Object** out() noexcept
    {
        reset();
        return &object_;
    }
    void** outVoid() noexcept
    {
        return reinterpret_cast<void**>(out());
    }

  private:
    Object* object_ = nullptr;
};

} // namespace tavi

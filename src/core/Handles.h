#pragma once

#include <utility>

#include <windows.h>
#include <objbase.h>
#include <shtypes.h>

// One owning type per kind of system handle. An object of these types belongs to one thread at a time.
namespace tavi {

template <class Traits>
class UniqueHandle {
  public:
    using Handle = typename Traits::Handle;

    UniqueHandle() noexcept = default;
    explicit UniqueHandle(Handle handle) noexcept : handle_(handle) {}
    UniqueHandle(UniqueHandle&& other) noexcept : handle_(other.release()) {}
    UniqueHandle& operator=(UniqueHandle&& other) noexcept
    {
        reset(other.release());
        return *this;
    }
    ~UniqueHandle()
    {
        reset();
    }

    Handle get() const noexcept
    {
        return handle_;
    }
    explicit operator bool() const noexcept
    {
        return handle_ != Traits::none();
    }
    Handle release() noexcept
    {
        return std::exchange(handle_, Traits::none());
    }
    void reset(Handle handle = Traits::none()) noexcept
    {
        if (handle_ != Traits::none())
            Traits::free(handle_);
        handle_ = handle;
    }
    // For functions that store a new handle through a pointer.
    Handle* out() noexcept
    {
        reset();
        return &handle_;
    }

  private:
    Handle handle_ = Traits::none();
};

// The value that means "no handle" depends on the kind.
template <class Type>
struct NullIsNone {
    using Handle = Type;
    static Handle none() noexcept
    {
        return nullptr;
    }
};
struct InvalidIsNone {
    using Handle = HANDLE;
    static Handle none() noexcept
    {
        return INVALID_HANDLE_VALUE;
    }
};

struct KernelTraits : NullIsNone<HANDLE> {
    static void free(Handle handle) noexcept
    {
        CloseHandle(handle);
    }
};
using KernelHandle = UniqueHandle<KernelTraits>;

struct FileTraits : InvalidIsNone {
    static void free(Handle handle) noexcept
    {
        CloseHandle(handle);
    }
};
using FileHandle = UniqueHandle<FileTraits>;

struct LibraryTraits : NullIsNone<HMODULE> {
    static void free(Handle library) noexcept
    {
        FreeLibrary(library);
    }
};
using LibraryHandle = UniqueHandle<LibraryTraits>;

struct RegistryTraits : NullIsNone<HKEY> {
    static void free(Handle key) noexcept
    {
        RegCloseKey(key);
    }
};
using RegistryKey = UniqueHandle<RegistryTraits>;

struct LocalTextTraits : NullIsNone<LPWSTR> {
    static void free(Handle text) noexcept
    {
        LocalFree(text);
    }
};
using LocalText = UniqueHandle<LocalTextTraits>;

template <class Object>
struct GdiTraits : NullIsNone<Object> {
    static void free(Object object) noexcept
    {
        DeleteObject(object);
    }
};
using BitmapHandle = UniqueHandle<GdiTraits<HBITMAP>>;
using BrushHandle = UniqueHandle<GdiTraits<HBRUSH>>;

struct IconTraits : NullIsNone<HICON> {
    static void free(Handle icon) noexcept
    {
        DestroyIcon(icon);
    }
};
using IconHandle = UniqueHandle<IconTraits>;

struct MemoryDcTraits : NullIsNone<HDC> {
    static void free(Handle dc) noexcept
    {
        DeleteDC(dc);
    }
};
using MemoryDc = UniqueHandle<MemoryDcTraits>;

struct ScreenDcTraits : NullIsNone<HDC> {
    static void free(Handle dc) noexcept
    {
        ReleaseDC(nullptr, dc);
    }
};
using ScreenDc = UniqueHandle<ScreenDcTraits>;

// A window of the thread that owns this object. The window may be destroyed earlier by other means.
struct WindowTraits : NullIsNone<HWND> {
    static void free(Handle window) noexcept
    {
        if (IsWindow(window))
            DestroyWindow(window);
    }
};
using WindowHandle = UniqueHandle<WindowTraits>;

struct FindTraits : InvalidIsNone {
    static void free(Handle find) noexcept
    {
        FindClose(find);
    }
};
using FindHandle = UniqueHandle<FindTraits>;

// An item id list of the shell's allocator.
struct ItemIdListTraits : NullIsNone<LPITEMIDLIST> {
    static void free(Handle list) noexcept
    {
        CoTaskMemFree(list);
    }
};
using ItemIdList = UniqueHandle<ItemIdListTraits>;

// Stores the address of an exported function, or null if the library has none of that name.
template <class Function>
void findFunction(HMODULE library, const char* name, Function& function) noexcept
{
    function = reinterpret_cast<Function>(reinterpret_cast<void*>(GetProcAddress(library, name)));
}

} // namespace tavi

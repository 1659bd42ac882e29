// Move-only owners for Win32 handles, C runtime files and platform heap blocks: one template,
// one traits struct and one alias per kind, so that every exit path releases what it holds.
#pragma once

#include <windows.h>
#include <winhttp.h>

#include <clocale>
#include <cstdio>
#include <utility>

namespace Kelvra
{

template <typename Traits>
class UniqueHandle
{
public:
    using pointer = typename Traits::pointer;

    UniqueHandle() noexcept : m_value(Traits::invalid()) {}
    explicit UniqueHandle(pointer value) noexcept : m_value(value) {}
    UniqueHandle(UniqueHandle&& other) noexcept : m_value(other.release()) {}
    UniqueHandle& operator=(UniqueHandle&& other) noexcept
    {
        if (this != &other)
            reset(other.release());
        return *this;
    }
    UniqueHandle(const UniqueHandle&) = delete;
    UniqueHandle& operator=(const UniqueHandle&) = delete;
    ~UniqueHandle() { reset(); }

    pointer get() const noexcept { return m_value; }
    explicit operator bool() const noexcept { return m_value != Traits::invalid(); }

    // Gives up ownership without closing.
    pointer release() noexcept { return std::exchange(m_value, Traits::invalid()); }

    // Closes what is held (if anything) and takes value.
    void reset(pointer value = Traits::invalid()) noexcept
    {
        close(m_value);
        m_value = value;
    }

    // For a handle kept in a plain field, where an exported class's layout fixes the field's type:
    // closes what the field holds (if anything) and empties it.
    static void close(pointer& field) noexcept
    {
        const pointer old = std::exchange(field, Traits::invalid());
        if (old != Traits::invalid())
            Traits::close(old);
    }

    // For out-parameters: closes what is held and returns the address to fill.
    pointer* put() noexcept
    {
        reset();
        return &m_value;
    }

private:
    pointer m_value;
};

// Event, mutex, thread, process: closed with CloseHandle, null when empty.
struct KernelHandleTraits
{
    using pointer = HANDLE;
    static pointer invalid() noexcept { return nullptr; }
    static void close(pointer value) noexcept { ::CloseHandle(value); }
};

// CreateFileW reports failure with INVALID_HANDLE_VALUE rather than null.
struct FileHandleTraits
{
    using pointer = HANDLE;
    static pointer invalid() noexcept { return INVALID_HANDLE_VALUE; }
    static void close(pointer value) noexcept { ::CloseHandle(value); }
};

struct CrtFileTraits
{
    using pointer = FILE*;
    static pointer invalid() noexcept { return nullptr; }
    static void close(pointer value) noexcept { std::fclose(value); }
};

struct RegKeyTraits
{
    using pointer = HKEY;
    static pointer invalid() noexcept { return nullptr; }
    static void close(pointer value) noexcept { ::RegCloseKey(value); }
};

struct EventSourceTraits
{
    using pointer = HANDLE;
    static pointer invalid() noexcept { return nullptr; }
    static void close(pointer value) noexcept { ::DeregisterEventSource(value); }
};

struct WinHttpHandleTraits
{
    using pointer = HINTERNET;
    static pointer invalid() noexcept { return nullptr; }
    static void close(pointer value) noexcept { ::WinHttpCloseHandle(value); }
};

// Memory the platform allocates with LocalAlloc (FormatMessageW, ConvertSidToStringSidW).
struct LocalMemoryTraits
{
    using pointer = void*;
    static pointer invalid() noexcept { return nullptr; }
    static void close(pointer value) noexcept { ::LocalFree(value); }
};

// A C runtime locale object from _create_locale.
struct CrtLocaleTraits
{
    using pointer = _locale_t;
    static pointer invalid() noexcept { return nullptr; }
    static void close(pointer value) noexcept { _free_locale(value); }
};

using UniqueEvent = UniqueHandle<KernelHandleTraits>;
using UniqueMutex = UniqueHandle<KernelHandleTraits>;
using UniqueThread = UniqueHandle<KernelHandleTraits>;
using UniqueProcess = UniqueHandle<KernelHandleTraits>;
using UniqueFileHandle = UniqueHandle<FileHandleTraits>;
using UniqueFile = UniqueHandle<CrtFileTraits>;
using UniqueRegKey = UniqueHandle<RegKeyTraits>;
using UniqueEventSource = UniqueHandle<EventSourceTraits>;
using UniqueWinHttp = UniqueHandle<WinHttpHandleTraits>;
using UniqueLocalMemory = UniqueHandle<LocalMemoryTraits>;
using UniqueCrtLocale = UniqueHandle<CrtLocaleTraits>;

} // namespace Kelvra

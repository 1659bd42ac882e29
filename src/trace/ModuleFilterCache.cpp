#include "trace/ModuleFilterCache.h"

#include <windows.h>

#include <algorithm>

namespace KelvraTrace
{

namespace
{

// FNV-1a over each name's length and code units: null and empty lists give the same value.
std::uint64_t FingerprintOfNames(const std::vector<std::wstring>* list) noexcept
{
    const std::uint64_t prime = 1099511628211ull;
    std::uint64_t hash = 14695981039346656037ull;
    if (list == nullptr)
        return hash;
    for (const std::wstring& name : *list)
    {
        hash = (hash ^ name.size()) * prime;
        for (const wchar_t unit : name)
            hash = (hash ^ static_cast<std::uint16_t>(unit)) * prime;
    }
    return hash;
}

} // namespace

ModuleKey KeyOfModule(const void* base) noexcept
{
    ModuleKey key;
    key.base = base;
    const auto* dos = static_cast<const IMAGE_DOS_HEADER*>(base);
    if (dos == nullptr || dos->e_magic != IMAGE_DOS_SIGNATURE)
        return key;
    const auto* nt =
        reinterpret_cast<const IMAGE_NT_HEADERS*>(static_cast<const char*>(base) + dos->e_lfanew);
    key.fingerprint = (static_cast<std::uint64_t>(nt->FileHeader.TimeDateStamp) << 32) ^
                      (static_cast<std::uint64_t>(nt->OptionalHeader.AddressOfEntryPoint) << 16) ^
                      nt->OptionalHeader.SizeOfImage;
    return key;
}

ModuleFilterCache::Answer ModuleFilterCache::Find(const ModuleKey& module,
                                                  const std::vector<std::wstring>* list,
                                                  int level) const noexcept
{
    const std::uint32_t version = m_version.load(std::memory_order_acquire);
    if (version % 2 != 0)
        return Answer::Unknown;
    Answer answer = Answer::Unknown;
    if (m_list.load(std::memory_order_relaxed) == list && m_level.load(std::memory_order_relaxed) == level)
    {
        const std::size_t count = std::min(m_count.load(std::memory_order_relaxed), kSlots);
        for (std::size_t i = 0; i < count; ++i)
        {
            const Slot& slot = m_slots[i];
            if (slot.base.load(std::memory_order_relaxed) == module.base &&
                slot.fingerprint.load(std::memory_order_relaxed) == module.fingerprint)
            {
                answer = slot.traced.load(std::memory_order_relaxed) ? Answer::Traced : Answer::Dropped;
                break;
            }
        }
    }
    // What was read counts only if no change began meanwhile.
    std::atomic_thread_fence(std::memory_order_acquire);
    return m_version.load(std::memory_order_relaxed) == version ? answer : Answer::Unknown;
}

void ModuleFilterCache::Sync(const std::vector<std::wstring>* list, int level) noexcept
{
    const std::uint64_t names = FingerprintOfNames(list);
    if (m_list.load(std::memory_order_relaxed) == list && m_level.load(std::memory_order_relaxed) == level &&
        m_names == names)
        return;
    BeginChange();
    m_list.store(list, std::memory_order_relaxed);
    m_level.store(level, std::memory_order_relaxed);
    m_names = names;
    m_count.store(0, std::memory_order_relaxed);
    EndChange();
}

void ModuleFilterCache::Store(const ModuleKey& module, bool traced) noexcept
{
    std::size_t count = m_count.load(std::memory_order_relaxed);
    BeginChange();
    if (count == kSlots)
        count = 0;
    Slot& slot = m_slots[count];
    slot.base.store(module.base, std::memory_order_relaxed);
    slot.fingerprint.store(module.fingerprint, std::memory_order_relaxed);
    slot.traced.store(traced, std::memory_order_relaxed);
    m_count.store(count + 1, std::memory_order_relaxed);
    EndChange();
}

void ModuleFilterCache::BeginChange() noexcept
{
    m_version.store(m_version.load(std::memory_order_relaxed) + 1, std::memory_order_relaxed);
    std::atomic_thread_fence(std::memory_order_release);
}

void ModuleFilterCache::EndChange() noexcept
{
    m_version.store(m_version.load(std::memory_order_relaxed) + 1, std::memory_order_release);
}

} // namespace KelvraTrace

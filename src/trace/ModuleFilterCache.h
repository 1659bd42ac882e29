// The module filter's answer for each module that emitted a line, readable without the trace
// lock, so that a line the filter drops costs neither the lock nor a module file name look-up.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace KelvraTrace
{

// A loaded module: its image base and a fingerprint of its headers, so that a module loaded
// later at the base of an unloaded one is not taken for it.
struct ModuleKey
{
    const void* base = nullptr;
    std::uint64_t fingerprint = 0;
};

// The key of the module whose image starts at base; base is a loaded image or null (the
// process's executable).
ModuleKey KeyOfModule(const void* base) noexcept;

// The answers hold for one filter state: the module list's address, the names in it and the
// level. The holder of the trace lock calls Sync after any change of that state and before it
// lets the lock go; a thread without the lock takes an answer only while the list address and
// level it sees are those of the state the answers hold for.
class ModuleFilterCache
{
public:
    enum class Answer
    {
        Unknown,
        Traced,
        Dropped,
    };

    // Any thread, with or without the trace lock. Unknown while the lock holder changes answers.
    Answer Find(const ModuleKey& module, const std::vector<std::wstring>* list, int level) const noexcept;
    // Trace lock holder only: forgets every answer unless list (address and names) and level are
    // those the answers hold for.
    void Sync(const std::vector<std::wstring>* list, int level) noexcept;
    // Trace lock holder only, after Sync: keeps the answer for module.
    void Store(const ModuleKey& module, bool traced) noexcept;

private:
    // More modules than this that trace at once only cost a look-up now and then.
    static constexpr std::size_t kSlots = 16;

    struct Slot
    {
        std::atomic<const void*> base{nullptr};
        std::atomic<std::uint64_t> fingerprint{0};
        std::atomic<bool> traced{false};
    };

    void BeginChange() noexcept;
    void EndChange() noexcept;

    // Odd while the lock holder changes the fields below: readers that see it move give Unknown.
    std::atomic<std::uint32_t> m_version{0};
    std::atomic<const void*> m_list{nullptr};
    std::atomic<int> m_level{0};
    std::uint64_t m_names = 0; // fingerprint of the names; the lock holder's only
    std::atomic<std::size_t> m_count{0};
    Slot m_slots[kSlots];
};

} // namespace KelvraTrace

// A raw block of bytes for handing to functions that take a plain pointer.
#pragma once

#include "KelvraApi.h"

#include <cstdint>
#include <new>

// Owns one uninitialised block of a size fixed at construction (the size is not kept).
// Copies and assignments share the block: it is released when the last Bytes that refers to it
// is destroyed or assigned another block, so every block is released exactly once. The count is
// atomic, so copies may live on different threads; one Bytes object itself is not thread-safe.
class KELVRA_API Bytes
{
public:
    // Throws std::bad_alloc when the block cannot be allocated. A size of 0 still gives a
    // unique, non-null pointer that must not be dereferenced. Implicit, as documented: Bytes b = 4096;
    Bytes(std::uint32_t size);
    Bytes(const Bytes& other);
    ~Bytes();
    // Afterwards both buffers give the same address; the block this one held is released if
    // no other Bytes shares it. No bytes are copied.
    Bytes& operator=(const Bytes& other);

    operator char*() const;
    operator unsigned char*() const;

private:
    void release();

    unsigned char* m_block;
};

#include "KelvraBytes.h"

#include <atomic>
#include <new>

namespace
{

// The owner count sits in front of the block, so that a Bytes object stays one pointer wide.
// Its size keeps the block aligned as operator new aligns.
struct alignas(__STDCPP_DEFAULT_NEW_ALIGNMENT__) BlockHeader
{
    std::atomic<long> owners;
};

BlockHeader* HeaderOf(unsigned char* block)
{
    return reinterpret_cast<BlockHeader*>(block - sizeof(BlockHeader));
}

} // namespace

Bytes::Bytes(std::uint32_t size)
{
    void* memory = ::operator new(sizeof(BlockHeader) + size);
    new (memory) BlockHeader{{1}};
    m_block = static_cast<unsigned char*>(memory) + sizeof(BlockHeader);
}

Bytes::Bytes(const Bytes& other) : m_block(other.m_block)
{
    HeaderOf(m_block)->owners.fetch_add(1, std::memory_order_relaxed);
}

Bytes::~Bytes()
{
    release();
}

Bytes& Bytes::operator=(const Bytes& other)
{
    // Take the new share before dropping the old one: self-assignment must not free the block.
    HeaderOf(other.m_block)->owners.fetch_add(1, std::memory_order_relaxed);
    release();
    m_block = other.m_block;
    return *this;
}

Bytes::operator char*() const
{
    return reinterpret_cast<char*>(m_block);
}

Bytes::operator unsigned char*() const
{
    return m_block;
}

void Bytes::release()
{
    BlockHeader* header = HeaderOf(m_block);
    if (header->owners.fetch_sub(1, std::memory_order_acq_rel) == 1)
    {
        header->~BlockHeader();
        ::operator delete(header);
    }
}

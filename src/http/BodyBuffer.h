// The block that holds a response body: address space for the largest body the client counts
// (4 GiB, its 32-bit counters) is reserved at once and memory committed as the bytes arrive, so
// the body is read straight into place, never copied, and costs only what it holds.
#pragma once

#include <cstdint>

namespace KelvraHttp
{

// A new block whose first byte is committed and reads as zero (committed is then 1), so that an
// empty body is readable however the request ends; null when the memory cannot be had.
unsigned char* ReserveBody(std::uint64_t& committed);
// Commits the block's first size bytes (committed holds how many are): they read as zero until
// written. False, with nothing changed, when size is beyond the block or memory cannot be had.
bool CommitBody(unsigned char* body, std::uint64_t& committed, std::uint64_t size);
// Frees a block (null: nothing).
void ReleaseBody(unsigned char* body);

} // namespace KelvraHttp

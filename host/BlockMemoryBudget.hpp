#pragma once

#include <cstdint>
#include <memory>

namespace host {

/// The decoded strips and tiles of all GeoTIFF images open in the process
/// share one memory budget, so that files declaring huge blocks cannot make
/// the reader allocate more than this, however many of them are read at
/// once. A real product needs well under 64 MiB per image (one row of strips
/// or tiles); the default leaves room for four polarizations of that size.
constexpr uint64_t kDefaultBlockMemoryBudget = uint64_t(256) << 20;
/// The budget can be set lower or higher, never above this.
constexpr uint64_t kMaxBlockMemoryBudget = uint64_t(1) << 30;

/// Sets the process's budget in bytes (at most kMaxBlockMemoryBudget). Memory
/// already held stays held; only later allocations are checked against it.
void SetBlockMemoryBudget(uint64_t bytes);
uint64_t BlockMemoryBudget();
/// Bytes held by all decoded-block buffers right now.
uint64_t BlockMemoryInUse();
/// Bytes the budget can still give (0 when it was lowered below what is held).
uint64_t BlockMemoryLeft();

/// A buffer for decoded blocks. Its bytes are charged to the budget before
/// they are allocated and given back when the buffer is freed; they start
/// uninitialised, so pages no block is decoded into are never touched.
class BudgetedBytes {
  public:
    BudgetedBytes() = default;
    ~BudgetedBytes();
    BudgetedBytes(const BudgetedBytes &) = delete;
    BudgetedBytes &operator=(const BudgetedBytes &) = delete;

    /// Replaces the buffer by one of size bytes. Returns false, holding
    /// nothing, when the budget cannot hold them; throws std::bad_alloc when
    /// the system cannot.
    bool Allocate(uint64_t size);
    unsigned char *Data() const { return bytes.get(); }
    uint64_t Size() const { return size; }

  private:
    void Free();

    std::unique_ptr<unsigned char[]> bytes;
    uint64_t size = 0;
};

} // namespace host

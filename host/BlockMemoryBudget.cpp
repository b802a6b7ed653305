#include "host/BlockMemoryBudget.hpp"

#include <algorithm>
#include <atomic>
#include <new>

namespace host {
namespace {

std::atomic<uint64_t> budget{kDefaultBlockMemoryBudget};
std::atomic<uint64_t> inUse{0};

// Takes bytes from the budget unless that would exceed it; a concurrent
// charge between the check and the update makes the loop check again.
bool Charge(uint64_t bytes) {
    uint64_t held = inUse.load();
    do {
        if (bytes > budget.load() || held > budget.load() - bytes)
            return false;
    } while (!inUse.compare_exchange_weak(held, held + bytes));
    return true;
}

} // namespace

void SetBlockMemoryBudget(uint64_t bytes) {
    budget = std::min(bytes, kMaxBlockMemoryBudget);
}

uint64_t BlockMemoryBudget() { return budget; }

uint64_t BlockMemoryInUse() { return inUse; }

uint64_t BlockMemoryLeft() {
    const uint64_t held = inUse;
    const uint64_t limit = budget;
    return held < limit ? limit - held : 0;
}

BudgetedBytes::~BudgetedBytes() { Free(); }

bool BudgetedBytes::Allocate(uint64_t newSize) {
    Free();
    if (!Charge(newSize))
        return false;
    try {
        bytes.reset(new unsigned char[newSize]);
    } catch (const std::bad_alloc &) {
        inUse -= newSize;
        throw;
    }
    size = newSize;
    return true;
}

void BudgetedBytes::Free() {
    bytes.reset();
    inUse -= size;
    size = 0;
}

} // namespace host

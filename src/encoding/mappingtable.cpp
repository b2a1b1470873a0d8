#include "encoding/mappingtable.h"

#include <algorithm>

namespace {

constexpr std::size_t kKeys = 0x10000;

} // namespace

MappingTable::MappingTable(const quint16 *pairs, std::size_t count) : m_pairs(pairs), m_count(count)
{
}

const quint16 *MappingTable::Build(bool byUnit) const
{
    std::lock_guard<std::mutex> lock(m_building);
    std::atomic<const quint16 *> &slot = byUnit ? m_codeOfUnit : m_unitOfCode;
    if (const quint16 *built = slot.load(std::memory_order_acquire))
        return built;
    // The tables are process-wide constants: the arrays are never freed.
    auto *dense = new quint16[kKeys];
    std::fill(dense, dense + kKeys, kNone);
    for (std::size_t i = 0; i < m_count; ++i) {
        const quint16 key = byUnit ? UnitAt(i) : CodeAt(i);
        if (dense[key] == kNone)
            dense[key] = byUnit ? CodeAt(i) : UnitAt(i);
    }
    slot.store(dense, std::memory_order_release);
    return dense;
}

#include "encoding/mappingtable.h"

#include <algorithm>

MappingTable::MappingTable(const quint16 *pairs, std::size_t count)
    : m_pairs(pairs), m_count(count)
{
}

bool MappingTable::ToUnit(unsigned int code, quint16 *unit) const
{
    std::size_t low = 0;
    std::size_t high = m_count;
    while (low < high) {
        const std::size_t mid = low + (high - low) / 2;
        if (CodeAt(mid) < code)
            low = mid + 1;
        else
            high = mid;
    }
    if (low == m_count || CodeAt(low) != code)
        return false;
    if (unit)
        *unit = UnitAt(low);
    return true;
}

bool MappingTable::ToCode(unsigned int unit, quint16 *code) const
{
    std::call_once(m_byUnitBuilt, [this] {
        m_byUnit.resize(m_count);
        for (std::size_t i = 0; i < m_count; ++i)
            m_byUnit[i] = quint16(i);
        std::stable_sort(m_byUnit.begin(), m_byUnit.end(),
                         [this](quint16 a, quint16 b) { return UnitAt(a) < UnitAt(b); });
    });
    const auto it = std::lower_bound(m_byUnit.begin(), m_byUnit.end(), unit,
                                     [this](quint16 index, unsigned int u) { return UnitAt(index) < u; });
    if (it == m_byUnit.end() || UnitAt(*it) != unit)
        return false;
    if (code)
        *code = CodeAt(*it);
    return true;
}

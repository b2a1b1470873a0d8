#pragma once

#include <QtGlobal>

#include <cstddef>
#include <mutex>
#include <vector>

// A read-only code <-> Unicode table: (code, unit) pairs sorted by code, where
// a code below 0x100 is a single byte and a two-byte code is
// lead * 256 + trail. Lookups are binary searches; where several codes share
// a unit, the one earliest in the table wins.
class MappingTable
{
public:
    MappingTable(const quint16 *pairs, std::size_t count);
    MappingTable(const MappingTable &) = delete;
    MappingTable &operator=(const MappingTable &) = delete;

    // False when the code is not in the table.
    bool ToUnit(unsigned int code, quint16 *unit) const;
    // False when no code maps to the unit.
    bool ToCode(unsigned int unit, quint16 *code) const;

    std::size_t Size() const { return m_count; }

private:
    quint16 CodeAt(std::size_t index) const { return m_pairs[2 * index]; }
    quint16 UnitAt(std::size_t index) const { return m_pairs[2 * index + 1]; }

    const quint16 *m_pairs;
    std::size_t m_count;
    // Pair indices ordered by unit, then by position; built on first use.
    mutable std::vector<quint16> m_byUnit;
    mutable std::once_flag m_byUnitBuilt;
};

namespace encodingtables {
// GB 2312 in EUC-CN form, with ASCII.
extern const MappingTable kGB2312;
// Shift_JIS (JIS X 0208), with ASCII and the half-width katakana A1-DF.
extern const MappingTable kShiftJis;
// Windows code page 949, with ASCII; its codes with both bytes in A1-FE are
// KS X 1001 in EUC-KR form.
extern const MappingTable kCp949;
} // namespace encodingtables

#pragma once

#include <QtGlobal>

#include <atomic>
#include <cstddef>
#include <mutex>

// A read-only code <-> Unicode table: (code, unit) pairs sorted by code, where
// a code below 0x100 is a single byte and a two-byte code is
// lead * 256 + trail. Where several codes share a unit (or a code appears
// twice), the pair earliest in the table wins.
//
// Lookups index two dense 64 Ki-entry arrays (128 KiB each), built from the
// pairs on the first lookup in each direction, so that converting a text
// costs one array access per character.
class MappingTable
{
public:
    MappingTable(const quint16 *pairs, std::size_t count);
    MappingTable(const MappingTable &) = delete;
    MappingTable &operator=(const MappingTable &) = delete;

    // False when the code is not in the table.
    bool ToUnit(unsigned int code, quint16 *unit) const { return Find(false, code, unit); }
    // False when no code maps to the unit.
    bool ToCode(unsigned int unit, quint16 *code) const { return Find(true, unit, code); }

    std::size_t Size() const { return m_count; }

private:
    // Marks an absent entry of the dense arrays: no pair holds 0xFFFF, which
    // ends a table.
    static constexpr quint16 kNone = 0xFFFF;

    quint16 CodeAt(std::size_t index) const { return m_pairs[2 * index]; }
    quint16 UnitAt(std::size_t index) const { return m_pairs[2 * index + 1]; }
    // Looks key up in the dense array of units by code (byUnit false) or of
    // codes by unit, building the array on first use.
    bool Find(bool byUnit, unsigned int key, quint16 *value) const
    {
        if (key > 0xFFFF)
            return false;
        const quint16 *dense = (byUnit ? m_codeOfUnit : m_unitOfCode).load(std::memory_order_acquire);
        if (!dense)
            dense = Build(byUnit);
        if (dense[key] == kNone)
            return false;
        if (value)
            *value = dense[key];
        return true;
    }
    const quint16 *Build(bool byUnit) const;

    const quint16 *m_pairs;
    std::size_t m_count;
    // Unit of every code and code of every unit, kNone where there is none;
    // null until built. They live as long as the process.
    mutable std::atomic<const quint16 *> m_unitOfCode{nullptr};
    mutable std::atomic<const quint16 *> m_codeOfUnit{nullptr};
    mutable std::mutex m_building;
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

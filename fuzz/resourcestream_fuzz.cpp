// Loads arbitrary bytes as a compiled resource file. What loads must list
// consistently, save, and load back to the same table.
#include "resources/resourcestream.h"

#include <cstddef>
#include <cstdint>

namespace {

void Check(bool condition)
{
    if (!condition)
        __builtin_trap();
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    const QByteArray bytes(reinterpret_cast<const char *>(data), int(size));
    ResourceStream stream;
    if (!stream.LoadFrom(bytes)) {
        // A refused input leaves the stream as new.
        QVector<ResourceEntry> none;
        Check(stream.GetResources(none) == 0);
        return 0;
    }
    stream.Dump();

    QVector<ResourceEntry> entries;
    stream.GetResources(entries);
    for (const ResourceEntry &entry : entries)
        Check(stream.GetResource(entry.type, entry.id) == entry.data);
    // Every ID listed is backed by at least one byte of input.
    Check(entries.size() <= bytes.size());

    QByteArray saved;
    if (!stream.SaveTo(saved))
        return 0;
    ResourceStream back;
    Check(back.LoadFrom(saved));
    QVector<ResourceEntry> again;
    back.GetResources(again);
    Check(again.size() == entries.size());
    for (int i = 0; i < entries.size(); ++i) {
        Check(again[i].type == entries[i].type && again[i].id == entries[i].id);
        Check(again[i].data == entries[i].data);
    }
    return 0;
}

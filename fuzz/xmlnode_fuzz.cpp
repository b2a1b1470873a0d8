// Reads arbitrary bytes as an XML document with the quick reader and with
// QXmlStreamReader alone: both must take or refuse it together and, when
// they take it, give the same tree; a tree written out must read back as
// itself.
#include "common/xmlnode.h"
#include "common/xmlwriter.h"

#include "fuzzutil.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    using fuzzutil::Check;
    const QByteArray bytes = fuzzutil::Bytes(data, size);
    const std::unique_ptr<XmlNode> quick = XmlNode::Parse(bytes);
    const std::unique_ptr<XmlNode> full = XmlNode::ParseFully(bytes);
    Check((quick == nullptr) == (full == nullptr));
    if (!quick)
        return 0;
    const QByteArray written = XmlWriter::Serialize(*quick, 0);
    Check(written == XmlWriter::Serialize(*full, 0));
    const std::unique_ptr<XmlNode> again = XmlNode::Parse(written);
    Check(again != nullptr);
    Check(XmlWriter::Serialize(*again, 0) == written);
    return 0;
}

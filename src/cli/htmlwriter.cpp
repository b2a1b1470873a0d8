#include "cli/htmlwriter.h"

HtmlWriter::HtmlWriter() : m_text(QStringLiteral("<!DOCTYPE html>\n"))
{
}

QString HtmlWriter::Escape(const QString &text)
{
    QString escaped;
    escaped.reserve(text.size());
    for (const QChar c : text) {
        switch (c.unicode()) {
        case '&':
            escaped += QStringLiteral("&amp;");
            break;
        case '<':
            escaped += QStringLiteral("&lt;");
            break;
        case '>':
            escaped += QStringLiteral("&gt;");
            break;
        case '"':
            escaped += QStringLiteral("&quot;");
            break;
        case '\'':
            escaped += QStringLiteral("&#39;");
            break;
        case 0:
            escaped += QChar::ReplacementCharacter;
            break;
        default:
            escaped += c;
        }
    }
    return escaped;
}

void HtmlWriter::Tag(const char *tag, Attributes attributes, bool empty)
{
    m_text += QLatin1Char('<') + QLatin1String(tag);
    for (const auto &[name, value] : attributes)
        m_text += QLatin1Char(' ') + QLatin1String(name) + QStringLiteral("=\"") + Escape(value) + QLatin1Char('"');
    m_text += empty ? QStringLiteral("/>") : QStringLiteral(">");
}

void HtmlWriter::Open(const char *tag, Attributes attributes)
{
    Tag(tag, attributes, false);
    m_open.append(QLatin1String(tag));
}

void HtmlWriter::Empty(const char *tag, Attributes attributes)
{
    Tag(tag, attributes, true);
}

void HtmlWriter::Element(const char *tag, const QString &text, Attributes attributes)
{
    Open(tag, attributes);
    Text(text);
    Close();
}

void HtmlWriter::Text(const QString &text)
{
    m_text += Escape(text);
}

void HtmlWriter::Trusted(const char *markup)
{
    m_text += QString::fromUtf8(markup);
}

void HtmlWriter::Close()
{
    if (m_open.isEmpty())
        return;
    m_text += QStringLiteral("</") + m_open.takeLast() + QLatin1Char('>');
    if (m_open.size() <= 2)
        m_text += QLatin1Char('\n');
}

QByteArray HtmlWriter::Finish()
{
    while (!m_open.isEmpty())
        Close();
    return m_text.toUtf8();
}

#pragma once

#include <QByteArray>
#include <QString>
#include <QStringList>

#include <initializer_list>
#include <utility>

// Writes an HTML5 document, element by element. Tag and attribute names are
// the caller's literals; every text and attribute value goes through
// Escape, the one place where markup characters are neutralised, so a name
// or log line like "<script>" is shown, never run. Trusted() is only for the
// page's own constant style sheet and script.
//
//     HtmlWriter html;
//     html.Open("p", {{"class", "note"}});
//     html.Text(moduleName);
//     html.Close();
//     QByteArray page = html.Finish();
class HtmlWriter
{
public:
    using Attributes = std::initializer_list<std::pair<const char *, QString>>;

    HtmlWriter();

    void Open(const char *tag, Attributes attributes = {});
    // An element without content (meta, input, rect, ...).
    void Empty(const char *tag, Attributes attributes = {});
    // An element holding only text.
    void Element(const char *tag, const QString &text, Attributes attributes = {});
    void Text(const QString &text);
    void Trusted(const char *markup);
    // Closes the innermost open element.
    void Close();

    // The document with every element still open closed, UTF-8.
    QByteArray Finish();

    // text with &, <, >, " and ' replaced by character references.
    static QString Escape(const QString &text);

private:
    void Tag(const char *tag, Attributes attributes, bool empty);

    QString m_text;
    QStringList m_open;
};

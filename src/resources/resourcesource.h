#pragma once

#include "../common/export.h"

#include <QString>
#include <QStringList>

// Compiles a small XML resource source into a compiled resource file. This is
// the format of the stand-in resource compilers that the demo environment
// ships in place of the SDK's:
//
//   <resources>
//     <string id="1" format="UTF-8">Hello</string>     type 1 unless given;
//                                                      format: number or name
//     <object id="1" mime="text/plain">text</object>   type 6 unless given
//     <binary type="0x5000" id="3" hex="01 02 0a"/>    or file="relative/path"
//   </resources>
//
// Numbers are decimal or "0x" hexadecimal; types and IDs are 16-bit. Any
// other XML document (a device pack, for example) is stored whole as one
// binary resource of type 0x7000, ID 1. Returns false with a reason in error
// when the source cannot be read, is not XML, holds a bad value or the
// output cannot be written, and when two resources share a type and ID.
HARNESS_EXPORT bool CompileResourceSource(const QString &source, const QString &output, QString *error);
// The same, but with lost given, a string that its format cannot hold is
// not stored with a character changed: every such character is added to
// lost ("line 3, string 1: character 7 U+30C6 'テ'"), nothing is written and
// the result is false.
HARNESS_EXPORT bool CompileResourceSource(const QString &source, const QString &output, QString *error,
                                          QStringList *lost);

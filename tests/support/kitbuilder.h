#pragma once

// The tests build their kits with the library's KitWriter (modules/kitwriter.h),
// the writer of the tool's demo environment:
//
//     QTemporaryDir dir;
//     kitbuilder::KitBuilder kit(dir.path() + "/kit");
//     kitbuilder::Module audio;
//     audio.kind = "ctf";
//     audio.name = "AudioPlay";
//     audio.testCases = {"t1", "t2"};
//     audio.package.classIds = {0x01020304};
//     audio.package.programs = {{"AudioPlay_k", "-v"}};
//     audio.package.behaviour = "...";   // what the emulated handset runs
//     kit.AddSourceModule("tests/multimedia/audio", audio);  // description, src/, package/
//     kit.AddFrameworkPackage("testframeworks", "ctf", "Win32", "Debug");
//     ASSERT_TRUE(kit.Ok()) << kit.Errors().join("\n").toStdString();

#include "support/handsetfixture.h"

#include "modules/kitwriter.h"

namespace kitbuilder {

using Module = KitModule;
using KitBuilder = KitWriter;

} // namespace kitbuilder

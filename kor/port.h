/// @file port.h
/// What a port to another system gives: one source a subject, its name ending in the system's, as filePosix.cpp. CMake
/// picks them by that ending. Everything else of libkor, libtav and libtav-inspect is standard C++.
///
/// | source          | gives                                                                                    |
/// | --------------- | ---------------------------------------------------------------------------------------- |
/// | file…           | the functions of kor/fileNative.h: opening, transfer, locks, sizes, syncing, renaming, mapping,
/// holes | | systemError…    | `codeOfSystemError`: one table from the system's errors to codes | | thread…         |
/// `korThreadID`, of tav/kor.h                                                                | | lineBuffered…   |
/// `isLineBuffered`: how a standard stream passes on what is written to it                    | | fileWatch…      |
/// `FileWatch`: waiting for a file to grow; looking ten times a second will do                |
///
/// In a browser there is no system: kor/fileBrowser.cpp, which the page is built with, asks the worker around the
/// module.
///
/// The byte order is asked for in tav/byteOrder.h, how symbols are exported in tav/decl.h, and what separates folders
/// in tav/kor.h. The program asks for more: tools/host/host.h (terminals, open files, signals) and
/// tools/host/machine.h.
#pragma once

#include "kor/fileNative.h"
#include "kor/fileWatch.h"
#include "kor/lineBuffered.h"
#include "kor/systemError.h"

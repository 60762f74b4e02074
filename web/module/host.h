/// @file host.h
/// What the worker around the module does for it, beside the files of kor/fileBrowser.cpp.
#pragma once

#include <cstdint>

extern "C" {
/// Takes a piece of an answer, UTF-8 JSON; it is copied.
__attribute__((import_module("host"), import_name("emit"))) void hostEmit(const char* json, uint32_t length);
/// Takes how far the work is.
__attribute__((import_module("host"), import_name("progress"))) void hostProgress(uint64_t offset);
}

#define TAV_WEB_EXPORT(name) extern "C" __attribute__((export_name(#name)))

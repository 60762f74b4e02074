/// @file decl.h
/// How names get out of a shared library and into a program, and what constants are in either language. C and C++.
#pragma once

#if defined(_WIN32)
#define KOR_DECL_EXPORT __declspec(dllexport)
#define KOR_DECL_IMPORT __declspec(dllimport)
#else
#define KOR_DECL_EXPORT __attribute__((visibility("default")))
#define KOR_DECL_IMPORT __attribute__((visibility("default")))
#endif

#if defined(__cplusplus)
#define TAV_CONSTANT inline constexpr
#else
#define TAV_CONSTANT static const
#endif

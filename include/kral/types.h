/**
 * @file types.h
 * What every family header shares: calling convention, export mark, handle type.
 * kral.h has the rules of the interface.
 */
#ifndef KRAL_TYPES_H
#define KRAL_TYPES_H

#include <stdint.h>

#if defined(_WIN32)
#define KRAL_CALL __cdecl
#if defined(KRAL_BUILDING)
#define KRAL_API __declspec(dllexport)
#else
#define KRAL_API __declspec(dllimport)
#endif
#else
#define KRAL_CALL
#define KRAL_API __attribute__((visibility("default")))
#endif

#ifdef __cplusplus
extern "C" {
#endif

/** Stands for one handset on one port; 0 is never valid. */
typedef uint32_t KRAL_HANDLE;

#ifdef __cplusplus
}
#endif

#endif

/* What the library shows to its callers. The only place that knows how a compiler spells it. */
#pragma once

#if defined(_WIN32) && defined(ORVENIX_BUILDING)
#define ORVENIX_EXPORT __declspec(dllexport)
#elif defined(_WIN32)
#define ORVENIX_EXPORT __declspec(dllimport)
#else
#define ORVENIX_EXPORT __attribute__((visibility("default")))
#endif

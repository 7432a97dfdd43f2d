/// \file
/// What the shared library exports. Everything without a mark is hidden.
#ifndef ORVADRCORE_EXPORT_H
#define ORVADRCORE_EXPORT_H

/// Marks a class or function that callers may use.
#define ORVADRCORE_API __attribute__((visibility("default")))

/// Marks a private function of such a class, which only the library calls.
#define ORVADRCORE_LOCAL __attribute__((visibility("hidden")))

#endif

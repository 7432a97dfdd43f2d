/// \file
/// The marks on what the shared library shows, and on what it hides of that.
#ifndef ORVADRCORE_EXPORT_H
#define ORVADRCORE_EXPORT_H

/// Stands before the name of a class, or before a function, that callers may use.
#define ORVADRCORE_API __attribute__((visibility("default")))

/// Stands before a private function of such a class, for the library alone.
#define ORVADRCORE_LOCAL __attribute__((visibility("hidden")))

#endif

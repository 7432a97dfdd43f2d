/// \file
/// The mark on every class that the shared library shows; all else in it is hidden.
#ifndef ORVADRCORE_EXPORT_H
#define ORVADRCORE_EXPORT_H

#define ORVADRCORE_API __attribute__((visibility("default")))

#endif

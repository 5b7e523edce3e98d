#ifndef QUORIN_EXPORT_H
#define QUORIN_EXPORT_H

/* Marks what the shared library exports; everything else is built hidden. */
#if defined(_WIN32)
#  if defined(QUORIN_BUILDING)
#    define QUORIN_EXPORT __declspec(dllexport)
#  else
#    define QUORIN_EXPORT __declspec(dllimport)
#  endif
#else
#  define QUORIN_EXPORT __attribute__((visibility("default")))
#endif

#endif

#ifndef VEXO_EXPORT_H
#define VEXO_EXPORT_H

/* Marks what libvexo offers; everything else stays hidden inside the library. */
#define VEXO_API __attribute__((visibility("default")))

#ifdef __cplusplus
#define VEXO_BEGIN_C extern "C" {
#define VEXO_END_C }
#else
#define VEXO_BEGIN_C
#define VEXO_END_C
#endif

typedef int BOOL;

#endif

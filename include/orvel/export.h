#ifndef ORVEL_EXPORT_H
#define ORVEL_EXPORT_H

/* Marks what liborvel exports; everything else stays hidden inside the library. */
#define ORVEL_API __attribute__((visibility("default")))

#endif

#ifndef TESSEL_EXPORT_H
#define TESSEL_EXPORT_H

/* Marks the exported interface; everything else in libtessel is hidden. */
#define TESSEL_EXPORT __attribute__((visibility("default")))

#ifdef __cplusplus
#define TESSEL_C_BEGIN extern "C" {
#define TESSEL_C_END }
#else
#define TESSEL_C_BEGIN
#define TESSEL_C_END
#endif

#endif /* TESSEL_EXPORT_H */

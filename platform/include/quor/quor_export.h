#ifndef QUOR_EXPORT_H
#define QUOR_EXPORT_H

#define QUOR_EXPORT __attribute__((visibility("default")))

#endif /* QUOR_EXPORT_H */

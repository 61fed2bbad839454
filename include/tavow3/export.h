// Marks the names that libtavow3 exports; everything else is hidden.
#ifndef TAVOW3_EXPORT_H_
#define TAVOW3_EXPORT_H_

#define TAVOW3_EXPORT __attribute__((visibility("default")))

#endif  // TAVOW3_EXPORT_H_

// Visibility of the library's internal parts that its own tests and tools use.
#ifndef TAVOW3_SRC_BASE_EXPORT_H_
#define TAVOW3_SRC_BASE_EXPORT_H_

#define TAVOW3_INTERNAL __attribute__((visibility("default")))

#endif  // TAVOW3_SRC_BASE_EXPORT_H_

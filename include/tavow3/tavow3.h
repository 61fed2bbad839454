// Umbrella header: every public header of libtavow3.
#ifndef TAVOW3_TAVOW3_H_
#define TAVOW3_TAVOW3_H_

#include <tavow3/export.h>

#endif  // TAVOW3_TAVOW3_H_

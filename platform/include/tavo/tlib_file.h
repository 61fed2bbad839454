// File tests of the core platform library. Thread-safe.
#ifndef TAVO_TLIB_FILE_H_
#define TAVO_TLIB_FILE_H_

// Returns 1 when `path` names an existing file system object (any type,
// symbolic links followed), else 0.
int TLIBCFileExist(const char* path);

// Creates `path` (mode 0644) when missing, otherwise updates its times.
// Returns 0 on success, -1 with errno set.
int TLIBCFileTouch(const char* path);

// Looks `key` up in a shell-style settings file of lines `key="value"`,
// `key='value'` or `key=value` (blanks around a line, blank lines and lines
// starting with '#' are skipped; the last assignment of a key wins). Returns
// 1 when the key is present with exactly `value`, 0 when it is absent or
// different, -1 with errno set when the file cannot be read or an argument is
// null.
int TLIBCFileCheckKeyValue(const char* path, const char* key, const char* value);

#endif  // TAVO_TLIB_FILE_H_

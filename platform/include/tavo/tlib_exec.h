// Running programs. Every call runs an argument vector directly (posix_spawn),
// never through a shell. All functions are thread-safe.
#ifndef TAVO_TLIB_EXEC_H_
#define TAVO_TLIB_EXEC_H_

#include <cstdio>

// Runs `path` with up to four arguments and waits for it. The list of
// arguments ends at the first null pointer; an empty string is passed as an
// empty argument. The program shares the caller's standard input, output and
// error and inherits no other descriptor. Returns the exit status (0-255), or
// -1 when the program could not be started (errno set) or was ended by a signal.
int TLIBCExec(const char* path, const char* arg1 = nullptr, const char* arg2 = nullptr,
              const char* arg3 = nullptr, const char* arg4 = nullptr);

// Option bits of TLIBCExecl. The value 0xBB that the firewall code passes asks
// for: wait, standard input from /dev/null, standard output and error to
// /dev/null, descriptors above 2 closed, and the exit status as the result.
enum : unsigned int {
  TLIB_EXEC_WAIT = 0x01,          // wait for the program; otherwise return 0 once started
  TLIB_EXEC_NULL_STDIN = 0x02,    // standard input from /dev/null
  TLIB_EXEC_SEARCH_PATH = 0x04,   // look `argv[0]` up in PATH when it has no slash
  TLIB_EXEC_NULL_STDOUT = 0x08,   // standard output to /dev/null
  TLIB_EXEC_NULL_STDERR = 0x10,   // standard error to /dev/null
  TLIB_EXEC_CLOSE_FDS = 0x20,     // the child gets no descriptor above 2
  TLIB_EXEC_NEW_SESSION = 0x40,   // the child starts a new session (setsid)
  TLIB_EXEC_STATUS = 0x80,        // with WAIT: return the exit status rather than 0/-1
};

// List form: runs argv[0] with the null-terminated vector `argv` (argv[0] is
// the program's path and its first argument). With TLIB_EXEC_WAIT and
// TLIB_EXEC_STATUS returns the exit status as TLIBCExec does; with
// TLIB_EXEC_WAIT alone returns 0 for exit status 0 and -1 otherwise; without
// TLIB_EXEC_WAIT returns 0 once the program started (it is reaped by nobody:
// callers that need that pass TLIB_EXEC_WAIT). -1 when it could not start
// (errno set; EINVAL for bits other than those above).
int TLIBCExecl(const char* const argv[], unsigned int flags);

// Starts the program `argv[0]` with the null-terminated vector `argv` and
// returns a stream reading its standard output. `mode` must begin with "r";
// a "B" anywhere in it merges the program's standard error into the stream
// (the web server writes its test report there). The program shares the
// caller's standard input and inherits no descriptor above 2. Returns null
// with errno set when the pipe or the program could not be set up. The stream
// must be closed with TLIBCPclose, not fclose.
FILE* TLIBCPopen(const char* const argv[], const char* mode);

// Closes a stream of TLIBCPopen and waits for its program. Returns the exit
// status (0-255), or -1 when the program was ended by a signal or the stream
// is unknown (errno ECHILD; such a stream is left open).
int TLIBCPclose(FILE* stream);

#endif  // TAVO_TLIB_EXEC_H_

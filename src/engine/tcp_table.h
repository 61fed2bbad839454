// Reading the kernel's TCP socket tables, "/proc/net/tcp" and "/proc/net/tcp6".
#ifndef TAVOW3_SRC_ENGINE_TCP_TABLE_H_
#define TAVOW3_SRC_ENGINE_TCP_TABLE_H_

#include <cstddef>
#include <memory>
#include <string>

#include "base/export.h"
#include "base/unique_fd.h"

namespace tavow3 {

// The grammar of a table line: a line is accepted exactly when sscanf with
// this format assigns all three values (local port, state, inode).
inline constexpr char kTcpTableLineFormat[] =
    "%*d: %*64[0-9A-Fa-f]:%hx %*64[0-9A-Fa-f]:%*X %X %*X:%*X %*X:%*X %*X %*d %*d %llu ";

// The values of one table line that the port checks use.
struct TcpTableLine {
  unsigned short local_port = 0;
  unsigned int state = 0;  // 1 established, 2 SYN sent, 3 SYN received, 10 listening ...
  unsigned long long inode = 0;
};

// Parses the C string `text`. Returns true and fills *line when
// sscanf(text, kTcpTableLineFormat, ...) would return 3, with the same values
// (numbers wrap and saturate as scanf's do); otherwise returns false and
// leaves *line unchanged.
TAVOW3_INTERNAL bool ParseTcpTableLine(const char* text, TcpTableLine* line);

// Reads one table file line by line as fgets with a 1024-byte buffer would:
// pieces of at most 1023 bytes, each ending after a newline or where the
// buffer is full. Pieces that do not parse (the header) are skipped. Not
// thread-safe; one reader per thread.
class TAVOW3_INTERNAL TcpTableReader {
 public:
  // Opens `path`; is_open() is false when that failed.
  explicit TcpTableReader(const std::string& path);
  ~TcpTableReader();
  TcpTableReader(const TcpTableReader&) = delete;
  TcpTableReader& operator=(const TcpTableReader&) = delete;

  bool is_open() const { return fd_.valid(); }
  // The next line that parses. False at the end of the file or on a read
  // error (the lines read so far stand).
  bool Next(TcpTableLine* line);

  // Size of the read buffer: reads of the table ask for this many bytes.
  static constexpr size_t kBufferSize = 64 * 1024;

 private:
  // Moves the unread bytes to the front and reads more behind them; sets
  // at_eof_ when nothing more comes.
  void Fill();

  base::UniqueFd fd_;
  std::unique_ptr<char[]> buffer_;  // kBufferSize bytes and one spare for a NUL
  size_t begin_ = 0;  // first unread byte
  size_t end_ = 0;    // end of the bytes read
  bool at_eof_ = false;
};

}  // namespace tavow3

#endif  // TAVOW3_SRC_ENGINE_TCP_TABLE_H_

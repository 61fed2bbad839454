#include "engine/tcp_table.h"

#include <fcntl.h>

#include <cstring>

#include "base/file_io.h"

namespace tavow3 {
namespace {

// fgets with a 1024-byte buffer returns at most this many bytes per call.
constexpr size_t kMaxPiece = 1023;

}  // namespace

TcpTableReader::TcpTableReader(const std::string& path)
    : fd_(base::Open(path, O_RDONLY)), buffer_(new char[kBufferSize + 1]) {}

TcpTableReader::~TcpTableReader() = default;

void TcpTableReader::Fill() {
  if (begin_ > 0) {
    std::memmove(buffer_.get(), buffer_.get() + begin_, end_ - begin_);
    end_ -= begin_;
    begin_ = 0;
  }
  const long count = base::ReadSome(fd_.get(), buffer_.get() + end_, kBufferSize - end_);
  if (count <= 0) {
    at_eof_ = true;  // a read error ends the table like its end does
    return;
  }
  end_ += static_cast<size_t>(count);
}

bool TcpTableReader::Next(TcpTableLine* line) {
  if (!is_open()) return false;
  for (;;) {
    const size_t available = end_ - begin_;
    char* const start = buffer_.get() + begin_;
    const size_t window = available < kMaxPiece ? available : kMaxPiece;
    const void* newline = std::memchr(start, '\n', window);
    size_t piece;
    if (newline != nullptr) {
      piece = static_cast<const char*>(newline) - start + 1;
    } else if (window == kMaxPiece) {
      piece = kMaxPiece;
    } else if (!at_eof_) {
      Fill();  // moves the unread bytes: look again from the top
      continue;
    } else if (available > 0) {
      piece = available;  // the last line has no newline
    } else {
      return false;
    }
    begin_ += piece;
    // The piece becomes a C string for the matcher: the byte after it (the
    // next line's first, or the spare byte at the buffer's end) is put back.
    char* const after = buffer_.get() + begin_;
    const char saved = *after;
    *after = '\0';
    const bool parsed = ParseTcpTableLine(start, line);
    *after = saved;
    if (parsed) return true;
  }
}

}  // namespace tavow3

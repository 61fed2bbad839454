// A regular expression that only ever answers "does the whole text match".
#ifndef TAVOW3_SRC_PORTAL_FULL_MATCH_PATTERN_H_
#define TAVOW3_SRC_PORTAL_FULL_MATCH_PATTERN_H_

#include <cstdint>
#include <string>

#include "base/export.h"

struct pcre2_real_code_8;

namespace tavow3::portal {

// A PCRE2 pattern compiled once, anchored at both ends, with no captures.
// Matching is const and thread-safe. Instances are meant to live for the whole
// process (function-local statics that are never destroyed).
class TAVOW3_INTERNAL FullMatchPattern {
 public:
  // `options` are PCRE2 compile options (PCRE2_CASELESS, PCRE2_UTF ...); the
  // anchoring options are added. A pattern that does not compile matches nothing.
  FullMatchPattern(const char* pattern, uint32_t options);
  ~FullMatchPattern();
  FullMatchPattern(const FullMatchPattern&) = delete;
  FullMatchPattern& operator=(const FullMatchPattern&) = delete;

  // True when `text`, from its first to its last byte, matches the pattern.
  // Text that is not valid UTF-8 never matches a UTF-mode pattern.
  bool FullMatch(const std::string& text) const;

 private:
  pcre2_real_code_8* code_;
};

}  // namespace tavow3::portal

#endif  // TAVOW3_SRC_PORTAL_FULL_MATCH_PATTERN_H_

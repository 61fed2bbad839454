#include "portal/full_match_pattern.h"

#define PCRE2_CODE_UNIT_WIDTH 8
#include <pcre2.h>

#include <memory>

namespace tavow3::portal {
namespace {

struct MatchDataFree {
  void operator()(pcre2_match_data* data) const { pcre2_match_data_free(data); }
};

}  // namespace

FullMatchPattern::FullMatchPattern(const char* pattern, uint32_t options) {
  int error = 0;
  PCRE2_SIZE offset = 0;
  code_ = pcre2_compile(reinterpret_cast<PCRE2_SPTR>(pattern), PCRE2_ZERO_TERMINATED,
                        options | PCRE2_ANCHORED | PCRE2_ENDANCHORED, &error, &offset, nullptr);
  // Without JIT support the interpreter runs the same pattern.
  if (code_ != nullptr) (void)pcre2_jit_compile(code_, PCRE2_JIT_COMPLETE);
}

FullMatchPattern::~FullMatchPattern() { pcre2_code_free(code_); }

bool FullMatchPattern::FullMatch(const std::string& text) const {
  if (code_ == nullptr) return false;
  // One offset pair is all a match needs; the patterns capture nothing.
  std::unique_ptr<pcre2_match_data, MatchDataFree> data(pcre2_match_data_create(1, nullptr));
  if (!data) return false;
  return pcre2_match(code_, reinterpret_cast<PCRE2_SPTR>(text.data()), text.size(), 0, 0,
                     data.get(), nullptr) >= 0;
}

}  // namespace tavow3::portal

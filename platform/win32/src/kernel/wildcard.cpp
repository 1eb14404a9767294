#include "kernel/wildcard.h"

#include <cstddef>
#include <vector>

namespace win32 {
namespace {

enum class Op { Literal, Star, DosStar, DosQm, DosDot };

struct Token {
  Op op;
  char c;  // Literal only
};

std::vector<Token> Rewrite(std::string_view pattern) {
  if (pattern == "*.*") return {{Op::Star, 0}};
  std::size_t kept = pattern.size();
  while (kept > 0 && pattern[kept - 1] == '.') --kept;
  std::vector<Token> tokens;
  for (std::size_t i = 0; i < kept; ++i) {
    const char c = pattern[i];
    // Looked up in the untrimmed pattern, so the "*" of "*." still sees its dot.
    const char next = i + 1 < pattern.size() ? pattern[i + 1] : '\0';
    if (c == '?') {
      tokens.push_back({Op::DosQm, 0});
    } else if (c == '*') {
      tokens.push_back({next == '.' ? Op::DosStar : Op::Star, 0});
    } else if (c == '.' && (next == '?' || next == '*')) {
      tokens.push_back({Op::DosDot, 0});
    } else {
      tokens.push_back({Op::Literal, c});
    }
  }
  return tokens;
}

// ASCII only, whatever the locale; other bytes must be equal.
char Lower(char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }

bool SameLetter(char a, char b) { return Lower(a) == Lower(b); }

}  // namespace

bool MatchesFileWildcard(std::string_view pattern, std::string_view name) {
  const std::vector<Token> tokens = Rewrite(pattern);
  const std::size_t n = name.size();
  const std::size_t lastDot = name.rfind('.');  // npos when the name has no dot
  const bool hasDot = lastDot != std::string_view::npos;

  // ok[j] for the tokens from p on: does tokens[p..] match name[j..]? Filled from the
  // last token backwards, keeping only the row below (next) and the current one.
  std::vector<char> next(n + 1, 0), cur(n + 1, 0);
  next[n] = 1;  // no tokens left: only the empty rest matches
  for (std::size_t p = tokens.size(); p-- > 0;) {
    const Token& t = tokens[p];
    for (std::size_t j = n + 1; j-- > 0;) {
      const bool atEnd = j == n;
      bool ok = false;
      switch (t.op) {
        case Op::Literal:
          ok = !atEnd && SameLetter(name[j], t.c) && next[j + 1];
          break;
        case Op::Star:
          ok = next[j] || (!atEnd && cur[j + 1]);
          break;
        case Op::DosStar: {
          // It may stop only at or after the last dot, and never eats that dot.
          const bool mayStop = !hasDot || j >= lastDot;
          const bool mayEat = !atEnd && j != lastDot;
          ok = (mayStop && next[j]) || (mayEat && cur[j + 1]);
          break;
        }
        case Op::DosQm:
          ok = (atEnd || name[j] == '.') ? next[j] : next[j + 1];
          break;
        case Op::DosDot:
          ok = atEnd ? next[j] : (name[j] == '.' && next[j + 1]);
          break;
      }
      cur[j] = ok;
    }
    next.swap(cur);
  }
  return next[0] != 0;
}

}  // namespace win32

// SPDX-License-Identifier: MIT
#include "raid/mdp_major.h"

#include "nurocore/handle.h"
#include "nurocore/text.h"
#include "nurocore/types.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string_view>

namespace
{

constexpr char DEVICES_PATH[] = "/proc/devices";

// A word that grows as it is read.
struct WORD {
    HEAP_OWNER<char> pszText;
    size_t cch = 0;
    size_t cb = 0;
};

constexpr size_t WORD_STEP = 100;

bool WordAppend(WORD &word, char ch)
{
    if (word.cch + 1 >= word.cb) {
        void *const pNew = realloc(word.pszText.get(), word.cb + WORD_STEP);
        if (pNew == nullptr) {
            return false;
        }
        (void)word.pszText.release();
        word.pszText.reset(static_cast<char *>(pNew));
        word.cb += WORD_STEP;
    }
    word.pszText.get()[word.cch++] = ch;
    word.pszText.get()[word.cch] = '\0';
    return true;
}

bool IsWord(const WORD &word, std::string_view expected)
{
    return std::string_view(word.pszText.get(), word.cch) == expected;
}

bool EndsInActive(const WORD &word)
{
    constexpr std::string_view ACTIVE = "active";
    return std::string_view(word.pszText.get(), word.cch).ends_with(ACTIVE);
}

// What ended the comment: the line or the stream.
int CommentSkip(FILE *pFile)
{
    int ch = fgetc(pFile);
    while (ch != EOF && ch != '\n') {
        ch = fgetc(pFile);
    }
    return ch;
}

// The md driver's reports may have "active(auto-read-only)", which is read as two words; the second
// gets its opening parenthesis back here.
void WordFixUp(WORD &word)
{
    constexpr char READ_ONLY_TORN[] = "auto-read-only)";
    if (IsWord(word, READ_ONLY_TORN) && WordAppend(word, ')')) {
        memmove(word.pszText.get() + 1, READ_ONLY_TORN, sizeof(READ_ONLY_TORN));
        word.pszText.get()[0] = '(';
    }
}

// The next word of the stream: blanks, tabs and new lines end one, '#' begins a comment up to the
// line's end, quotes group blanks and are dropped. False at the end of the stream and when memory
// runs out.
bool WordRead(FILE *pFile, WORD &word)
{
    word = {};
    int chQuote = 0;
    for (int ch = fgetc(pFile); ch != EOF; ch = fgetc(pFile)) {
        if (chQuote == 0 && ch == '#') {
            ch = CommentSkip(pFile);
        }
        if (ch == EOF) {
            break;
        }
        if (ch == '\n') {
            chQuote = 0; // an unmatched quote affects its own line only
        }
        const bool fSeparator = chQuote == 0 && (ch == ' ' || ch == '\t' || ch == '\n');
        const bool fTorn = chQuote == 0 && ch == '(' && EndsInActive(word);
        if ((fSeparator || fTorn) && word.cch > 0) {
            break;
        }
        if (fSeparator) {
            continue;
        }
        if (chQuote != 0 && ch == chQuote) {
            chQuote = 0;
        } else if (chQuote == 0 && (ch == '"' || ch == '\'')) {
            chQuote = ch;
        } else if (!WordAppend(word, static_cast<char>(ch))) {
            return false;
        }
    }
    WordFixUp(word);
    return word.cch > 0;
}

} // namespace

i32 MdpMajorRead()
{
    const STREAM_OWNER pFile(fopen(DEVICES_PATH, "r"));
    if (pFile == nullptr) {
        return MAJOR_UNKNOWN;
    }
    bool fBlockSection = false;
    bool fAfterBlock = false;
    i32 number = MAJOR_UNKNOWN;
    WORD word;
    while (WordRead(pFile.get(), word)) {
        const char chFirst = word.pszText.get()[0];
        if (chFirst >= '0' && chFirst <= '9') {
            number = NLIBCStrToI32(word.pszText.get());
        }
        if (fBlockSection && IsWord(word, "mdp")) {
            return number;
        }
        fBlockSection = fBlockSection || (fAfterBlock && IsWord(word, "devices:"));
        fAfterBlock = IsWord(word, "Block");
    }
    return MAJOR_UNKNOWN;
}

// A bounded cursor over one reply from the card, for the parsers that pick fields out of it.
// The cursor never reads outside [begin, end), never allocates, and writes text fields only
// within the size the caller gives (always NUL-terminated when that size is at least 1). Every
// step returns 1 when it moved over what it was asked for and 0 when that is not there; a step
// that fails leaves the cursor where it was, so a parser can try one reading and then another.
//
// Fields are read one at a time and the separators between them are stepped over explicitly
// (Comma), so a parser says exactly which layout it accepts:
//   FieldCursor c(reply, length);
//   int32_t index, state;
//   if (c.NextTag("+CLCC:") && c.NextInt(&index) && c.Comma() && c.SkipField() && c.Comma() &&
//       c.NextInt(&state)) ...
#pragma once

#include <cstddef>
#include <cstdint>

namespace vqm {

class FieldCursor {
  public:
    // Over length bytes of text (none when text is null or length is below 1).
    FieldCursor(const char* text, int length);
    FieldCursor(const char* begin, const char* end);

    // Moves just past the next occurrence of tag that opens a line (it stands at the start of
    // the text or right after a CR or LF) at or after the cursor, and past the blanks after it.
    // A tag inside a line, such as in a name or a message text, is not taken.
    int NextTag(const char* tag);
    // Moves just past the next occurrence of text at or after the cursor, wherever it stands.
    int SeekPast(const char* text);
    // Moves to the start of the next line (past the CR and LF bytes that end this one); 0 when
    // no line follows.
    int NextLine();

    // Steps over blanks and tabs; SkipSpace also over CR and LF. Both always succeed.
    void SkipBlanks();
    void SkipSpace();

    // A decimal integer (an optional '-', then digits) after blanks; the cursor stops right
    // after its digits. Values beyond 32 bits saturate. *value is left alone on failure.
    int NextInt(int32_t* value);
    // A quoted field: after blanks, an opening quote at the cursor and its closing quote on the
    // same line. Copies what stands between them into out (cut to outSize - 1 bytes) and its
    // copied length into *length; the cursor stops right after the closing quote. On failure
    // out is left empty and *length 0 (this holds for every reader of text below).
    int NextQuoted(char* out, size_t outSize, int* length);
    // The next complete quoted field wherever it starts at or after the cursor, its closing
    // quote anywhere before the end (lines included): for replies read that loosely.
    int SeekQuoted(char* out, size_t outSize, int* length);
    // A bare phone number after blanks: the run of digits and '+' characters at the cursor,
    // copied as NextQuoted copies. 0 when no such character stands there.
    int NextNumber(char* out, size_t outSize, int* length);
    // Steps over the field at the cursor: a quoted text (quotes included) or anything up to the
    // next ',' or line end. An empty field succeeds without moving; 0 when a quote opened here
    // is not closed on the line.
    int SkipField();
    // Steps over the ',' at the cursor.
    int Comma();
    // Steps over exactly these bytes at the cursor.
    int Literal(const char* text);

    // 1 at the end of the text or at a CR or LF.
    int AtLineEnd() const;
    int AtEnd() const;
    // The first unread byte; equals End() at the end.
    const char* Position() const { return at_; }
    const char* End() const { return end_; }

  private:
    int CopyOut(const char* from, const char* to, char* out, size_t outSize, int* length) const;

    const char* begin_;
    const char* at_;
    const char* end_;
};

}  // namespace vqm

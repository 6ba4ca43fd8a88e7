// A text that a person looks for in the names of log rows.
//
// Names are compared as a person reads them: upper and lower case are the same, and so are the two
// ways in which a letter with a mark is written. The text may be copied from a sentence, which
// shows some characters as "\xNN" and a double quote with a backslash (client/log-sentence.h).
// Where a row's parameters are damaged, what is stored counts as a name.
#pragma once

#include <string>

class LogInfo;

class LogKeyword {
public:
    // An empty text fits every row. EXIT_USAGE (CommandError) for a text with a NUL.
    explicit LogKeyword(const std::string& text);

    [[nodiscard]] bool Fits(const LogInfo& row) const;

    // For LogFilter::keyword, which goes into a statement as it stands: a piece that all rows that
    // fit have in common, and others may have too. It holds only characters that mean themselves to
    // SQL, to a pattern and to JSON; empty when the text has none of them.
    [[nodiscard]] const std::string& PlainPart() const { return m_plain_part; }

private:
    [[nodiscard]] bool IsIn(const std::string& name) const;

    // Folded; empty: fits every row.
    std::u16string m_text;
    std::u16string m_text_as_shown;  // taken as a part of a sentence
    std::string m_plain_part;
};

// An independent reader of communication log files for the tests.
//
// It knows the file format only from its description (blocks of a header line, a dump or a text, and an
// empty line; CR LF line ends; UTF-8 without a byte-order mark) and shares no code with the library.
#pragma once

#include <string>
#include <vector>

namespace logtest
{

struct ParsedBlock
{
    enum Kind
    {
        Text,
        Sent,
        Received
    };
    Kind kind = Text;
    bool sync = true;
    unsigned year = 0, month = 0, day = 0, hour = 0, minute = 0, second = 0, milliseconds = 0;
    std::vector<unsigned char> data; // reconstructed from the hex column
    std::string text;                // the UTF-8 text of a text event
};

// Splits `file` into blocks. Returns the empty string when the whole file follows the format, otherwise
// a description of the first violation and its byte offset.
std::string ParseLog(const std::string& file, std::vector<ParsedBlock>& blocks);

} // namespace logtest

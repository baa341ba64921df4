#include "LogParser.h"

#include <cstring>

namespace logtest
{

namespace
{
const size_t kPerLine = 32;

class Reader
{
public:
    explicit Reader(const std::string& s) : m_s(s) {}

    bool AtEnd() const { return m_pos >= m_s.size(); }
    size_t Pos() const { return m_pos; }

    // The next line without its CR LF; false when no CR LF follows.
    bool Line(std::string& line)
    {
        const size_t end = m_s.find("\r\n", m_pos);
        if (end == std::string::npos)
            return false;
        line.assign(m_s, m_pos, end - m_pos);
        m_pos = end + 2;
        return true;
    }

    bool StartsBlockAt(size_t pos) const
    {
        static const char* const starts[] = {"Text Event, ", "SYNC WRITE ", "SYNC READ ", "ASYNC WRITE ",
                                             "ASYNC READ "};
        for (const char* s : starts)
            if (m_s.compare(pos, std::strlen(s), s) == 0)
                return true;
        return false;
    }

    // A text event's text runs to the first CR LF CR LF that is followed by the end of the file or the
    // start of another block.
    bool TextToBlockEnd(std::string& text)
    {
        size_t from = m_pos;
        for (;;)
        {
            const size_t end = m_s.find("\r\n\r\n", from);
            if (end == std::string::npos)
                return false;
            const size_t next = end + 4;
            if (next == m_s.size() || StartsBlockAt(next))
            {
                text.assign(m_s, m_pos, end - m_pos);
                m_pos = next;
                return true;
            }
            from = end + 1;
        }
    }

private:
    const std::string& m_s;
    size_t m_pos = 0;
};

bool IsDigit(char c)
{
    return c >= '0' && c <= '9';
}

// Reads an unsigned decimal at `p`; `exact` > 0 demands that many digits, 0 any count without a
// leading zero.
bool Number(const std::string& s, size_t& p, unsigned exact, unsigned& value)
{
    const size_t start = p;
    value = 0;
    while (p < s.size() && IsDigit(s[p]) && (exact == 0 || p - start < exact))
        value = value * 10 + unsigned(s[p++] - '0');
    const size_t n = p - start;
    if (n == 0 || (exact != 0 && n != exact))
        return false;
    if (exact == 0 && n > 1 && s[start] == '0')
        return false;
    return true;
}

bool Literal(const std::string& s, size_t& p, const char* text)
{
    const size_t n = std::strlen(text);
    if (s.compare(p, n, text) != 0)
        return false;
    p += n;
    return true;
}

// "2024/3/7, 09:05:02.045" filling the rest of `s` from `p`.
bool TimeStamp(const std::string& s, size_t p, ParsedBlock& b)
{
    if (!(Number(s, p, 4, b.year) && Literal(s, p, "/") && Number(s, p, 0, b.month) && Literal(s, p, "/") &&
          Number(s, p, 0, b.day) && Literal(s, p, ", ") && Number(s, p, 2, b.hour) && Literal(s, p, ":") &&
          Number(s, p, 2, b.minute) && Literal(s, p, ":") && Number(s, p, 2, b.second) &&
          Literal(s, p, ".") && Number(s, p, 3, b.milliseconds)))
        return false;
    return p == s.size() && b.month >= 1 && b.month <= 12 && b.day >= 1 && b.day <= 31 && b.hour < 24 &&
           b.minute < 60 && b.second < 60;
}

int HexValue(char c)
{
    if (c >= '0' && c <= '9')
        return c - '0';
    if (c >= 'A' && c <= 'F')
        return c - 'A' + 10;
    return -1; // lower case is not the format
}

// "SYNC WRITE request completed: 4 (0x4) bytes, <time stamp>"
bool DataHeader(const std::string& s, ParsedBlock& b, unsigned& count)
{
    size_t p = 0;
    if (Literal(s, p, "SYNC "))
        b.sync = true;
    else if (Literal(s, p, "ASYNC "))
        b.sync = false;
    else
        return false;
    if (Literal(s, p, "WRITE"))
        b.kind = ParsedBlock::Sent;
    else if (Literal(s, p, "READ"))
        b.kind = ParsedBlock::Received;
    else
        return false;
    unsigned hex = 0;
    if (!(Literal(s, p, " request completed: ") && Number(s, p, 0, count) && Literal(s, p, " (0x")))
        return false;
    const size_t start = p;
    for (; p < s.size() && HexValue(s[p]) >= 0; ++p)
        hex = hex * 16 + unsigned(HexValue(s[p]));
    if (p == start || (p - start > 1 && s[start] == '0') || hex != count)
        return false;
    return Literal(s, p, ") bytes, ") && TimeStamp(s, p, b);
}

// One dump line: a space, 32 hex cells of "XX " or three spaces (blanks only after the data), four
// spaces, then one printable character per byte.
std::string DumpLine(const std::string& s, std::vector<unsigned char>& data, size_t& bytes)
{
    const size_t hexEnd = 1 + 3 * kPerLine;
    if (s.size() < hexEnd + 4 || s[0] != ' ')
        return "dump line too short or not starting with a space";
    bytes = 0;
    for (size_t i = 0; i < kPerLine; ++i)
    {
        const char* cell = s.data() + 1 + 3 * i;
        if (cell[0] == ' ' && cell[1] == ' ' && cell[2] == ' ')
            continue;
        if (bytes != i)
            return "hex cell after a blank cell";
        const int hi = HexValue(cell[0]), lo = HexValue(cell[1]);
        if (hi < 0 || lo < 0 || cell[2] != ' ')
            return "malformed hex cell";
        data.push_back(static_cast<unsigned char>(hi * 16 + lo));
        ++bytes;
    }
    if (bytes == 0)
        return "dump line without bytes";
    if (s.compare(hexEnd, 4, "    ") != 0)
        return "no four spaces after the hex column";
    if (s.size() != hexEnd + 4 + bytes)
        return "printable column length differs from the byte count";
    for (size_t i = 0; i < bytes; ++i)
    {
        const unsigned char b = data[data.size() - bytes + i];
        const char expected = (b >= 0x21 && b <= 0x7E) ? char(b) : '.';
        if (s[hexEnd + 4 + i] != expected)
            return "printable column does not match the hex column";
    }
    return std::string();
}

std::string At(const Reader& r, const std::string& what)
{
    return what + " at byte " + std::to_string(r.Pos());
}
} // namespace

std::string ParseLog(const std::string& file, std::vector<ParsedBlock>& blocks)
{
    blocks.clear();
    if (file.compare(0, 3, "\xEF\xBB\xBF") == 0)
        return "the file starts with a byte-order mark";
    Reader r(file);
    std::string line;
    while (!r.AtEnd())
    {
        if (!r.Line(line))
            return At(r, "line without CR LF");
        if (line.find_first_of("\r\n") != std::string::npos)
            return At(r, "bare CR or LF in a header line");
        ParsedBlock b;
        if (line.compare(0, 12, "Text Event, ") == 0)
        {
            if (!TimeStamp(line, 12, b))
                return At(r, "bad text event header '" + line + "'");
            b.kind = ParsedBlock::Text;
            if (!r.TextToBlockEnd(b.text))
                return At(r, "text event without its closing empty line");
            blocks.push_back(std::move(b));
            continue;
        }
        unsigned count = 0;
        if (!DataHeader(line, b, count))
            return At(r, "bad block header '" + line + "'");
        bool shortLine = false;
        for (;;)
        {
            if (!r.Line(line))
                return At(r, "dump line without CR LF");
            if (line.empty())
                break;
            if (shortLine)
                return At(r, "a short dump line is not the last");
            size_t bytes = 0;
            const std::string error = DumpLine(line, b.data, bytes);
            if (!error.empty())
                return At(r, error);
            shortLine = bytes < kPerLine;
        }
        if (count != static_cast<unsigned>(b.data.size() & 0xFFFFFFFFu))
            return At(r, "byte count " + std::to_string(count) + " differs from the dump's " +
                             std::to_string(b.data.size()));
        blocks.push_back(std::move(b));
    }
    return std::string();
}

} // namespace logtest

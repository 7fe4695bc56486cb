// The qdm tool's input: a CSV signal read in bounded lines, and user text made
// safe to show in a one-line message.
#include <algorithm>
#include <cctype>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <string>
#include <string_view>
#include <vector>

#include "tool.h"

namespace qdm_cli {

void Bad(std::string message) { throw Failure{kUsage, {}, std::move(message)}; }

namespace {

// Bytes in the valid UTF-8 sequence that starts text[i] (at least 2), or 0.
// C1 controls (U+0080..U+009F) count as invalid: they are shown escaped.
size_t Utf8Length(std::string_view text, size_t i) {
  const auto at = [&](size_t k) { return static_cast<unsigned char>(text[i + k]); };
  const unsigned char c = at(0);
  size_t length = 0;
  unsigned char low = 0x80, high = 0xbf;  // the second byte's range
  if (c >= 0xc2 && c <= 0xdf) length = 2, low = c == 0xc2 ? 0xa0 : 0x80;
  if (c >= 0xe0 && c <= 0xef)
    length = 3, low = c == 0xe0 ? 0xa0 : 0x80, high = c == 0xed ? 0x9f : 0xbf;
  if (c >= 0xf0 && c <= 0xf4)
    length = 4, low = c == 0xf0 ? 0x90 : 0x80, high = c == 0xf4 ? 0x8f : 0xbf;
  if (length == 0 || i + length > text.size() || at(1) < low || at(1) > high) return 0;
  for (size_t k = 2; k < length; ++k)
    if (at(k) < 0x80 || at(k) > 0xbf) return 0;
  return length;
}

}  // namespace

std::string Shown(std::string_view text, size_t limit, bool noQuotes) {
  std::string out;
  for (size_t i = 0; i < text.size();) {
    if (i >= limit) return out + "...";
    const unsigned char c = static_cast<unsigned char>(text[i]);
    const size_t length = c >= 0x80 ? Utf8Length(text, i) : 0;
    if (c >= 0x20 && c < 0x7f && !(noQuotes && c == '"')) {
      out += static_cast<char>(c), ++i;
    } else if (length > 0) {
      out.append(text.substr(i, length)), i += length;
    } else {
      char hex[5];
      std::snprintf(hex, sizeof hex, "\\x%02x", c);
      out += hex, ++i;
    }
  }
  return out;
}

namespace {

// Lines of at most kMaxLineBytes from a stream of at most maxBytes, with no NUL.
class Lines {
 public:
  Lines(std::FILE* in, const std::string& shownName, uint64_t maxBytes)
      : in_(in), name_(shownName), max_(maxBytes), buffer_(size_t{1} << 16) {}

  // The next line without its '\n'; false at the end of the input.
  bool Next(std::string* line) {
    line->clear();
    ++number_;
    for (;;) {
      if (begin_ == end_ && !Fill()) return !line->empty();
      const char* first = buffer_.data() + begin_;
      const size_t left = end_ - begin_;
      const char* newline = static_cast<const char*>(std::memchr(first, '\n', left));
      const size_t take = newline ? size_t(newline - first) : left;
      if (line->size() + take > kMaxLineBytes)
        Bad(Where() + "a line longer than " + std::to_string(kMaxLineBytes >> 20) +
            " MiB: not a CSV signal");
      if (std::memchr(first, '\0', take)) Bad(Where() + "a NUL byte: not a text file");
      line->append(first, take);
      begin_ += take + (newline ? 1 : 0);
      if (newline) return true;
    }
  }
  size_t number() const { return number_; }
  std::string Where() const { return name_ + ":" + std::to_string(number_) + ": "; }

 private:
  bool Fill() {
    if (eof_) return false;
    begin_ = 0;
    end_ = std::fread(buffer_.data(), 1, buffer_.size(), in_);
    if (end_ == 0) {
      if (std::ferror(in_)) Bad("cannot read " + name_ + ": " + std::strerror(errno));
      eof_ = true;
      return false;
    }
    total_ += end_;
    if (total_ > max_)
      Bad(name_ + ": more than " + std::to_string(max_) +
          " bytes of input (--max-input-bytes sets the bound)");
    return true;
  }

  std::FILE* in_;
  std::string name_;
  uint64_t max_, total_ = 0;
  std::vector<char> buffer_;
  size_t begin_ = 0, end_ = 0, number_ = 0;
  bool eof_ = false;
};

std::string_view Trim(std::string_view s) {
  const size_t b = s.find_first_not_of(" \t\r");
  if (b == std::string_view::npos) return {};
  return s.substr(b, s.find_last_not_of(" \t\r") - b + 1);
}

std::vector<std::string_view> Split(std::string_view text, const CsvFormat& format) {
  std::vector<std::string_view> fields;
  if (format.blanks) {
    for (size_t i = 0; i < text.size();) {
      const size_t end = std::min(text.find_first_of(" \t", i), text.size());
      fields.push_back(text.substr(i, end - i));
      i = std::min(text.find_first_not_of(" \t", end), text.size());
    }
    return fields;
  }
  for (size_t i = 0;;) {
    const size_t end = std::min(text.find(format.delimiter, i), text.size());
    std::string_view f = Trim(text.substr(i, end - i));
    if (f.size() >= 2 && f.front() == '"' && f.back() == '"') f = f.substr(1, f.size() - 2);
    fields.push_back(f);
    if (end == text.size()) return fields;
    i = end + 1;
  }
}

bool Digits(std::string_view s) {
  return !s.empty() && std::all_of(s.begin(), s.end(), [](char c) { return c >= '0' && c <= '9'; });
}
bool SignedDigits(std::string_view s) {
  return Digits(s.substr(!s.empty() && (s[0] == '-' || s[0] == '+')));
}
bool NoCaseIs(std::string_view s, std::string_view word) {
  return s.size() == word.size() && std::equal(s.begin(), s.end(), word.begin(),
                                               [](char a, char b) { return (a | 0x20) == b; });
}

// A field that is meant as a number, well formed or not: a digit first (after a
// sign and a point), or nan, inf, infinity. A line with none is a header.
bool LooksNumeric(std::string_view f) {
  if (!f.empty() && (f[0] == '-' || f[0] == '+')) f.remove_prefix(1);
  if (!f.empty() && f[0] == '.') f.remove_prefix(1);
  return (!f.empty() && f[0] >= '0' && f[0] <= '9') || NoCaseIs(f, "nan") || NoCaseIs(f, "inf") ||
         NoCaseIs(f, "infinity");
}

enum class Parsed { kNumber, kNotNumber, kOutOfRange };

// The whole field as a double. With `decimalComma` one comma in a field without
// a point is the decimal point.
Parsed ToNumber(std::string_view field, bool decimalComma, double* v) {
  std::string copy;
  if (decimalComma && std::count(field.begin(), field.end(), ',') == 1 &&
      field.find('.') == std::string_view::npos) {
    copy.assign(field);
    copy[copy.find(',')] = '.';
    field = copy;
  }
  if (field.size() > 1 && field[0] == '+' && field[1] != '-') field.remove_prefix(1);
  const char* last = field.data() + field.size();
  const auto r = std::from_chars(field.data(), last, *v);
  if (field.empty() || r.ptr != last) return Parsed::kNotNumber;
  return r.ec == std::errc() ? Parsed::kNumber : Parsed::kOutOfRange;
}

// Header names that say real and imaginary part: re/im, real/imag, I/Q and the
// like, as words of the name (x_re, Re(z), real_part).
bool NamesParts(std::string_view name, std::initializer_list<std::string_view> words) {
  for (size_t i = 0; i < name.size();) {
    size_t end = i;
    while (end < name.size() && std::isalnum(static_cast<unsigned char>(name[end]))) ++end;
    for (std::string_view w : words)
      if (NoCaseIs(name.substr(i, end - i), w)) return true;
    i = end + 1;
  }
  return false;
}

std::string Named(std::string_view s) {
  std::string out(1, '\'');
  out += Shown(s, kFieldShown);
  return out += '\'';
}

// The 0-based columns to read, from --column(s) or the number of fields.
std::vector<size_t> Choose(const std::vector<std::string>& header, size_t fields,
                           const CsvFormat& format, const std::string& where, bool* unnamedPair) {
  std::vector<size_t> pick;
  *unnamedPair = false;
  for (const std::string& c : format.columns) {
    size_t index = 0;
    if (Digits(c)) {
      const auto r = std::from_chars(c.data(), c.data() + c.size(), index);
      if (r.ec != std::errc() || index < 1 || index > fields)
        Bad(where + "no column " + Shown(c, kFieldShown) + ": the file has " +
            std::to_string(fields) + (fields == 1 ? " column" : " columns"));
      pick.push_back(index - 1);
      continue;
    }
    if (header.empty()) Bad(where + "no header line to find column " + Named(c) + " in");
    const auto found = std::find(header.begin(), header.end(), c);
    if (found == header.end()) Bad(where + "no column named " + Named(c) + " in the header");
    if (std::find(found + 1, header.end(), c) != header.end())
      Bad(where + "two columns are named " + Named(c) + "; give its number instead");
    pick.push_back(size_t(found - header.begin()));
  }
  if (!pick.empty()) return pick;
  if (fields == 1) return {0};
  if (fields > 2)
    Bad(where + std::to_string(fields) +
        " columns: choose one with --column N or two (real, imaginary) with --columns N,M");
  if (!header.empty() && !(NamesParts(header[0], {"re", "real", "i", "inphase"}) &&
                           NamesParts(header[1], {"im", "imag", "imaginary", "q", "quadrature"})))
    Bad(where + "two columns named " + Named(header[0]) + " and " + Named(header[1]) +
        ", not real and imaginary parts: give --column 2 (or --column NAME) for real samples, "
        "--columns 1,2 for complex ones");
  *unnamedPair = header.empty();
  return {0, 1};
}

}  // namespace

// A header is a first line with no field that looks like a number. Without
// --column(s), one column is real, two are (real, imaginary) unless what they
// hold says otherwise: a header naming something else, a first column counting
// up by one (an index or a year), or, with ',' as the delimiter, integers and
// digit runs on every line (decimal commas). Those are errors, not guesses.
Signal ReadCsv(std::FILE* in, const std::string& name, const CsvFormat& format) {
  const std::string shown = Shown(name, kNameShown);
  Lines lines(in, shown, format.maxBytes);
  const bool decimalComma = format.blanks || format.delimiter != ',';
  Signal s;
  std::vector<std::string> header;
  std::vector<size_t> pick;
  size_t fields = 0, rows = 0;
  bool unnamedPair = false, counting = true, commaDecimals = !decimalComma;
  long long previous = 0;
  for (std::string line; lines.Next(&line);) {
    std::string_view text = line;
    if (lines.number() == 1 && text.substr(0, 3) == "\xEF\xBB\xBF") text.remove_prefix(3);
    text = Trim(text.substr(0, text.find('#')));
    if (text.empty()) continue;
    const std::vector<std::string_view> f = Split(text, format);
    const std::string where = lines.Where();
    if (fields == 0) {
      fields = f.size();
      const bool isHeader = std::none_of(f.begin(), f.end(), LooksNumeric);
      if (isHeader) header.assign(f.begin(), f.end());
      pick = Choose(header, fields, format, where, &unnamedPair);
      if (isHeader) continue;
    }
    if (f.size() != fields)
      Bad(where + std::to_string(f.size()) + (f.size() == 1 ? " field" : " fields") +
          ", expected " + std::to_string(fields));
    for (const size_t c : pick) {
      double v = 0.0;
      const Parsed p = ToNumber(f[c], decimalComma, &v);
      if (p != Parsed::kNumber)
        Bad(where + "field " + std::to_string(c + 1) + " " + Named(f[c]) +
            (p == Parsed::kOutOfRange ? " is out of the range of a double" : " is not a number"));
      s.values.push_back(v);
    }
    if (unnamedPair) {
      long long k = 0;
      const bool integer =
          SignedDigits(f[0]) &&
          std::from_chars(f[0].data() + (f[0][0] == '+'), f[0].data() + f[0].size(), k).ec ==
              std::errc();
      counting = counting && integer && (rows == 0 || k == previous + 1);
      previous = k;
      commaDecimals = commaDecimals && integer && Digits(f[1]);
    }
    ++rows;
  }
  if (rows == 0) Bad(shown + ": no samples");
  if (unnamedPair && counting && rows >= 2)
    Bad(shown +
        ": the first of two columns counts up by one (an index or a year?): give "
        "--column 2 for the samples, or --columns 1,2 to read both as complex");
  if (unnamedPair && commaDecimals)
    Bad(shown +
        ": every line is an integer, a comma and digits, as numbers with a decimal "
        "comma are: give --delimiter ';' to read the comma as a decimal point, or "
        "--columns 1,2 to read two columns as complex");
  if (rows > INT32_MAX) Bad(shown + ": more than 2^31 - 1 samples");
  s.complex = pick.size() == 2;
  s.n = static_cast<int32_t>(rows);
  return s;
}

}  // namespace qdm_cli

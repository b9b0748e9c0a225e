// Hexadecimal digits of percent-escapes ("%2F"), as query strings and the media server's object
// ids write them: either case is read.
#pragma once

namespace harmona::util {

// The value of one hexadecimal digit, or -1 for any other character.
constexpr int HexDigitValue(char c) {
    if (c >= '0' && c <= '9')
        return c - '0';
    if (c >= 'a' && c <= 'f')
        return c - 'a' + 10;
    if (c >= 'A' && c <= 'F')
        return c - 'A' + 10;
    return -1;
}

// The byte that two hexadecimal digits write (0 to 255), or -1 when either is no digit.
constexpr int HexByteValue(char high, char low) {
    const int h = HexDigitValue(high);
    const int l = HexDigitValue(low);
    return h < 0 || l < 0 ? -1 : h * 16 + l;
}

}  // namespace harmona::util

// Text helpers of the doctor.
#pragma once

#include <ctime>
#include <string>
#include <vector>

namespace doctor {

std::string LowerCase(std::string text);  // of ASCII

// The text in double quotes.
std::string Quote(const std::string& text);

// The text without anything that a terminal would obey: control characters as \xNN.
std::string Printable(const std::string& text);

// At most `length` bytes of the text, whole characters of UTF-8, with "..." where it was cut. Text
// from outside is cut by Shown (redact.h), never before.
std::string Clip(const std::string& text, size_t length);

// "1 failure", "2 failures"
std::string Plural(size_t count, const std::string& word);

// "2024-05-01 12:00:00 UTC"
std::string Time(time_t when);

// "59 s", "12 min", "30 h", "400 days": always positive.
std::string Span(long long seconds);

// The candidate that the word was most likely meant to be; empty if none is near.
std::string Nearest(const std::string& word, const std::vector<std::string>& candidates);

// base64url (RFC 4648, section 5), without padding. Decoding takes standard base64 too; text that
// is neither gives an empty result.
int Base64Value(char c);  // of one character, in either alphabet; -1: not one
std::string EncodeBase64Url(const std::string& bytes);
std::string DecodeBase64Url(const std::string& text);

// True for 8-4-4-4-12 hexadecimal digits.
bool IsGuid(const std::string& text);

bool EndsWith(const std::string& text, const std::string& end);
bool HasSpaceAround(const std::string& text);
bool HasUpperCase(const std::string& text);

}  // namespace doctor

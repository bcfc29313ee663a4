// Undoing encodings, so that a secret is seen in them.
#pragma once

#include <string>
#include <vector>

namespace doctor {

// View is a decoded text that knows where each of its bytes came from in the original.
struct View {
  std::string text;
  std::vector<size_t> begin;
  std::vector<size_t> end;

  void Add(char byte, size_t from, size_t to) {
    text += byte;
    begin.push_back(from);
    end.push_back(to);
  }
};

View ViewOf(const std::string& text);

// One layer of percent-encoding, HTML character references and backslash escapes (JSON, names in
// certificates).
View Unescape(const View& view);

// What the runs of base64 characters (either alphabet) stand for, each read from its character
// number `skipped` on: of the four ways to read a run, one is in step with its encoder.
View DecodeBase64Runs(const View& view, size_t skipped);

}  // namespace doctor

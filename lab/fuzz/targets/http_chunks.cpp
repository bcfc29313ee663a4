// The body of an answer in chunks, one part each, up to 16, into a text that holds some already.
#include "sso/common.h"
#include "sso/internal/http_body.h"
#include "sso/utils.h"

#include "support/independent.h"
#include "support/target.h"
#include "support/transport.h"

FUZZ_TARGET(http_chunks) {
  fuzz::Answer answer;
  std::string expected = "before";
  for (const std::string& chunk : fuzz::parts(input, 16)) {
    answer.chunks.push_back(chunk);
    expected += fuzz::cString(chunk);  // a chunk ends at its first zero byte
  }
  // A body that begins with "!" belongs to a transfer that fails at its end.
  const bool failing = !input.empty() && input[0] == '!';
  answer.result = failing ? 18 : 0;
  fuzz::transport().answers = {answer};

  std::string response = "before";
  const std::vector<fuzz::Thrown> partial = {
      {typeid(QOVA::SSO::sso_err_resp), "Transferred a partial file"}};
  const bool done = fuzz::returns(partial, [&] {
    QOVA::SSO::httpGet("http://x/", response, true, QOVA::SSO::WriteToStringCallback);
  });
  fuzz::require(done != failing, "the result of the transfer");
  fuzz::require(response == expected, "another body");
  return done;
}

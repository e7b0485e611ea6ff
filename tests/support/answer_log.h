// Appends each answer that an end-to-end test receives to the file named by
// QUILLON_ANSWER_LOG, so that a later check can hold every answer against the
// published description of the interface. Does nothing when it is unset.
// Thread-safety: any thread; each answer is one append of the whole record.
#ifndef QUILLON_TESTS_SUPPORT_ANSWER_LOG_H_
#define QUILLON_TESTS_SUPPORT_ANSWER_LOG_H_

#include "support/http_client.h"

namespace quillon::test_support {

// The record is "answer <size>\n", then <size> bytes: the method and target
// line, the status line, the header lines, an empty line and the body.
// Throws std::runtime_error when the file cannot be written.
void logAnswer(const HttpRequest& request, const HttpResponse& response);

}  // namespace quillon::test_support

#endif  // QUILLON_TESTS_SUPPORT_ANSWER_LOG_H_

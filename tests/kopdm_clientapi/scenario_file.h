// A scenario file that the stand-in time service of this test process serves.
// The path is chosen, and KOPDM_SIM_SCENARIO set, before main() runs, so the
// stand-in's first call already reads it. The stand-in notices rewrites on
// its own watch thread; install() waits until the new text is being served.
#ifndef QUILLON_TESTS_KOPDM_CLIENTAPI_SCENARIO_FILE_H_
#define QUILLON_TESTS_KOPDM_CLIENTAPI_SCENARIO_FILE_H_

#include <functional>
#include <string>

namespace timesvc_test {

const std::string& scenarioPath();

// Writes `{"pdmMetadata":{"revision":N},<members>}` (N counts installs) by
// renaming a finished file over the scenario, and waits until it is served.
void install(const std::string& members);
// Writes `text` as is, in place, and waits until `served()` holds.
void installRaw(const std::string& text, const std::function<bool()>& served);
// Removes the scenario file and waits until `served()` holds.
void removeScenario(const std::function<bool()>& served);
// True once `condition` holds, false when it did not within ten seconds.
bool eventually(const std::function<bool()>& condition);

}  // namespace timesvc_test

#endif  // QUILLON_TESTS_KOPDM_CLIENTAPI_SCENARIO_FILE_H_

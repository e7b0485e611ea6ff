// The scenario served when no scenario file is named: three time references
// that put a boundary clock and the selected slave at the front of the
// published timescales and a master at the back.
#ifndef KOPDM_CLIENTAPI_DEFAULT_SCENARIO_H_
#define KOPDM_CLIENTAPI_DEFAULT_SCENARIO_H_

namespace kopdmsim {

const char* defaultScenarioText();

}  // namespace kopdmsim

#endif  // KOPDM_CLIENTAPI_DEFAULT_SCENARIO_H_

-- wrk script for bench/soak/run.sh: a mix of the service's requests, in
-- turn, until REQUESTS answers have arrived.
local requests = {}
local count = 0
local limit = tonumber(os.getenv("REQUESTS") or "1000000")

function init(args)
  local device = "/quillon/syncableDevices/pendulo/timekeeper/genericTk"
  requests[1] = wrk.format("GET", "/quillon/resources")
  requests[2] = wrk.format("GET", device)
  requests[3] = wrk.format("GET", "/quillon/timescales/pendulo/tr9/00-00-00-FF-FE-00-00-00")
  requests[4] = wrk.format("PUT", device,
    {["Content-Type"] = "vnd.ko.syncDomain.v0/json; charset=utf-8"}, '{"maxOffsetNanos":1000}')
end

local turn = 0
function request()
  turn = turn % #requests + 1
  return requests[turn]
end

function response(status, headers, body)
  count = count + 1
  if count >= limit then wrk.thread:stop() end
end

function done(summary, latency, requests)
  io.write(string.format("answers: %d, p99 %.0f us\n", summary.requests, latency:percentile(99)))
end


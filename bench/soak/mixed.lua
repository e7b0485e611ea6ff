-- wrk script for bench/soak/run.sh: a mix of the service's requests, in
-- turn, until REQUESTS answers have arrived.
local requests = {}
local count = 0
local limit = tonumber(os.getenv("REQUESTS") or "1000000")
-- wrk itself stops only at the end of its duration: the script that runs it
-- waits for this file and then interrupts it, which makes wrk print its
-- summary.
local finished = os.getenv("FINISHED_MARK")
local unexpected = os.getenv("UNEXPECTED_LOG")
local unexpectedCount = 0
local unusableCount = 0

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

-- Only the timescale that does not exist may fail (500 with its code in
-- X-Status-Code); the first few other failures are kept for a look.
function response(status, headers, body)
  count = count + 1
  if status ~= 200 and not (status == 500 and body:find("pendulo/tr9/00-00-00-FF-FE-00-00-00\\\"", 1, true)) then
    unexpectedCount = unexpectedCount + 1
    if body:find("-1074100993", 1, true) then unusableCount = unusableCount + 1 end
    if unexpected and unexpectedCount <= 20 then
      local file = io.open(unexpected, "a")
      file:write(status, " ", body, "\n")
      file:close()
    end
  end
  if count == limit then
    wrk.thread:stop()
    if finished then
      local file = io.open(finished, "w")
      file:write(unexpectedCount, " unexpected answers, ", unusableCount,
                 " of them \"scenario unusable\"\n")
      file:close()
    end
  end
end

function done(summary, latency, requests)
  io.write(string.format("answers: %d, p99 %.0f us\n", summary.requests, latency:percentile(99)))
end


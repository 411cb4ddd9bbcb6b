-- wrk script: every request is a "head" poll of one account that has nothing new.
-- TESSAL_USER, TESSAL_PASSWORD and TESSAL_ITERATION come from bench/server-head-wrk.sh.
wrk.method = "POST"
wrk.headers["Content-Type"] = "application/json"
wrk.headers["Accept"] = "application/json"
-- WRK_RECONNECT=1: a new connection for every poll, as devices behind some proxies do.
if os.getenv("WRK_RECONNECT") == "1" then wrk.headers["Connection"] = "close" end
wrk.body = string.format(
  '{\n  "user" : "%s",\n  "password" : "%s",\n  "action" : "head",\n  "iteration" : %s,\n  "device" : "wrk-bench"\n}',
  os.getenv("TESSAL_USER"), os.getenv("TESSAL_PASSWORD"), os.getenv("TESSAL_ITERATION") or "0")

local failures = 0

response = function(status, headers, body)
  if status ~= 200 or not string.find(body, '"action":"head"', 1, true) then
    failures = failures + 1
    if failures == 1 then io.stderr:write("unexpected reply: " .. status .. " " .. body .. "\n") end
  end
end

done = function(summary, latency, requests)
  io.write(string.format("requests: %d in %.2f s, %.0f req/s; errors: %d (status %d, timeouts %d)\n",
    summary.requests, summary.duration / 1e6, summary.requests / (summary.duration / 1e6),
    summary.errors.connect + summary.errors.read + summary.errors.write + summary.errors.status
      + summary.errors.timeout, summary.errors.status, summary.errors.timeout))
  io.write(string.format("latency: p50 %.2f ms, p90 %.2f ms, p99 %.2f ms, max %.2f ms\n",
    latency:percentile(50) / 1000, latency:percentile(90) / 1000, latency:percentile(99) / 1000,
    latency.max / 1000))
end

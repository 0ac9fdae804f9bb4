-- wrk driver of bench/run-soak: a mix of calls at a bounded rate, each
-- response checked and counted by the kind of call and its outcome.
--
-- Environment: SOAK_TOKEN (an attestation token), SOAK_EXPIRED_TOKEN (one
-- signed by the same key but expired), SOAK_ADMIN_TOKEN, SOAK_MASTER_KEY_ID
-- (what providers.get must report), SOAK_THREAD_RATE (calls per second at
-- most, per wrk thread).
--
-- The rate is bounded by pacing: each request waits in delay() for the next
-- free slot of the thread's schedule (one every 1/SOAK_THREAD_RATE seconds).
-- A thread that falls behind does not catch up later, so the rate never
-- exceeds the bound; it stays below it when the daemon answers too slowly
-- for the connections to keep up.
--
-- The JSON-RPC id names the kind of call, so the response (which echoes it)
-- can be classified without knowing its connection. Each thread keeps the
-- first keys that generate_key returned it; a decrypt call names one of them
-- by its index in the id, and must return that key. Outcomes: "ok" (the expected result),
-- "expected" (the expected refusal of a bad token or a malformed body), and
-- "unexpected" (anything else). done() prints one "soak-count" line per kind
-- and up to a few unexpected answers.

local api = "com.tarsel.orna.kms."
local token = os.getenv("SOAK_TOKEN")
local expired = os.getenv("SOAK_EXPIRED_TOKEN")
local admin = os.getenv("SOAK_ADMIN_TOKEN")
local masterKeyId = os.getenv("SOAK_MASTER_KEY_ID")
local slotMs = 1000 / tonumber(os.getenv("SOAK_THREAD_RATE"))

local ffi = require("ffi")
ffi.cdef [[
typedef struct { long tv_sec; long tv_nsec; } soak_timespec;
int clock_gettime(int clock, soak_timespec* now);
]]
local clockNow = ffi.new("soak_timespec")
local kClockMonotonic = 1

local function nowMs()
  ffi.C.clock_gettime(kClockMonotonic, clockNow)
  return tonumber(clockNow.tv_sec) * 1000 + tonumber(clockNow.tv_nsec) / 1e6
end

-- One cycle of the mix: 24 calls.
local cycle = {
  "generate", "decrypt", "generate", "decrypt", "status", "generate",
  "decrypt", "provider-get", "bad-token", "generate", "decrypt", "not-json",
  "generate", "decrypt", "status", "expired-token", "generate", "decrypt",
  "provider-get", "wrong-role", "bad-params", "not-json", "bad-envelope", "bad-params",
}
local kinds = {
  "generate", "decrypt", "status", "provider-get", "bad-token", "expired-token",
  "wrong-role", "not-json", "bad-params", "bad-envelope",
}

-- Per-thread state (every wrk thread runs its own copy of this script).
counts = {}
unexpected = {}
local position = 0
local serial = 0
local keys = {}  -- {wrappedKey, key} from the first generate_key answers
local kKeptKeys = 256

local threads = {}

function setup(thread)
  thread:set("threadId", #threads + 1)
  table.insert(threads, thread)
end

local function body(id, method, params)
  return '{"jsonrpc":"2.0","id":"' .. id .. '","method":"' .. method .. '","params":' .. params .. '}'
end

local function post(bearer, text)
  local headers = {["Content-Type"] = "application/json"}
  if bearer then headers["Authorization"] = "Bearer " .. bearer end
  return wrk.format("POST", "/api", headers, text)
end

local generateParams = '{"provider":"local","keySize":32}'

function request()
  position = position % #cycle + 1
  serial = serial + 1
  local kind = cycle[position]
  if kind == "decrypt" and #keys == 0 then kind = "generate" end
  if kind == "generate" then
    return post(token, body("generate", api .. "key_operation.generate_key", generateParams))
  elseif kind == "decrypt" then
    local index = math.random(#keys)
    return post(token, body("decrypt:" .. index, api .. "key_operation.decrypt",
      '{"provider":"local","wrappedKey":"' .. keys[index][1] .. '"}'))
  elseif kind == "status" then
    return post(token, body("status", api .. "status.get", "{}"))
  elseif kind == "provider-get" then
    return post(admin, body("provider-get", api .. "providers.get", '{"provider":"local"}'))
  elseif kind == "bad-token" then
    -- A different made-up token on every call.
    return post("t" .. threadId .. "-" .. serial .. "-" .. math.random(1e9),
      body("bad-token", api .. "key_operation.generate_key", generateParams))
  elseif kind == "expired-token" then
    return post(expired, body("expired-token", api .. "key_operation.generate_key", generateParams))
  elseif kind == "wrong-role" then
    return post(token, body("wrong-role", api .. "providers.get", '{"provider":"local"}'))
  elseif kind == "not-json" then
    return post(token, '{"jsonrpc":"2.0","id":"not-json","method":"' .. api ..
      'key_operation.generate_key","params":{"provider":"local",')
  elseif kind == "bad-params" then
    return post(token, body("bad-params", api .. "key_operation.generate_key",
      '{"provider":"local","keySize":"' .. serial .. '"}'))
  else
    return post(token, '{"jsonrpc":"1.0","id":"bad-envelope","method":"' .. api ..
      'status.get","params":{}}')
  end
end

local nextSlot = 0

function delay()
  local now = nowMs()
  if nextSlot < now then nextSlot = now end
  local wait = nextSlot - now
  nextSlot = nextSlot + slotMs
  return math.floor(wait)
end

local function has(text, part)
  return string.find(text, part, 1, true) ~= nil
end

local function unauthenticated(status, body)
  return status == 200 and has(body, '"name":"com.tarsel.lumo.std.errors.unauthenticated"')
end

-- "ok", "expected" or "unexpected" for an answer to a call of `kind`.
local function classify(kind, idText, status, body)
  if kind == "generate" then
    local wrapped, key = string.match(body, '"output":{"wrappedKey":"([^"]+)","key":"([^"]+)"}')
    if status ~= 200 or not wrapped then return "unexpected" end
    if #keys < kKeptKeys then table.insert(keys, {wrapped, key}) end
    return "ok"
  elseif kind == "decrypt" then
    local index = string.match(idText, "^decrypt:(%d+)$")
    local kept = index and keys[tonumber(index)]
    local got = string.match(body, '"output":{"key":"([^"]+)"}')
    return (status == 200 and kept ~= nil and got == kept[2]) and "ok" or "unexpected"
  elseif kind == "status" then
    return (status == 200 and has(body, '"output":{"health":"HEALTHY"')) and "ok" or "unexpected"
  elseif kind == "provider-get" then
    return (status == 200 and has(body, '"masterKeyId":"' .. masterKeyId .. '"')) and "ok"
      or "unexpected"
  elseif kind == "bad-token" then
    return unauthenticated(status, body) and "expected" or "unexpected"
  elseif kind == "expired-token" then
    return (unauthenticated(status, body) and
      has(body, '"id":"com.tarsel.orna.kms.authentication.invalid_token"')) and "expected"
      or "unexpected"
  elseif kind == "wrong-role" then
    return (status == 200 and has(body, '"name":"com.tarsel.lumo.std.errors.unauthorized"'))
      and "expected" or "unexpected"
  elseif kind == "not-json" then
    return (status == 200 and has(body, '"error":{"code":-32700')) and "expected" or "unexpected"
  elseif kind == "bad-params" then
    return (status == 200 and has(body, '"error":{"code":-32602')) and "expected" or "unexpected"
  elseif kind == "bad-envelope" then
    return (status == 200 and has(body, '"error":{"code":-32600')) and "expected" or "unexpected"
  end
  return "unexpected"
end

function response(status, headers, body)
  -- The id follows "jsonrpc" in every answer; it is null only for a body
  -- that is not JSON.
  local idText = string.match(body, '^{"jsonrpc":"2.0","id":"([^"]*)"')
  local kind
  if idText then
    kind = string.match(idText, "^[%a-]+")
  elseif string.match(body, '^{"jsonrpc":"2.0","id":null') then
    kind = "not-json"
  end
  local known = false
  for _, k in ipairs(kinds) do
    if k == kind then known = true end
  end
  if not known then kind = "unknown" end
  local outcome = classify(kind, idText or "", status, body)
  local name = kind .. " " .. outcome
  counts[name] = (counts[name] or 0) + 1
  if outcome == "unexpected" and #unexpected < 5 then
    table.insert(unexpected, kind .. " -> " .. status .. " " .. string.sub(body, 1, 300))
  end
end

function done(summary, latency, requests)
  -- Tables that cross from the threads must be flat: "kind outcome" -> count.
  local total = {}
  local samples = {}
  for _, t in ipairs(threads) do
    for name, n in pairs(t:get("counts")) do total[name] = (total[name] or 0) + n end
    for _, line in ipairs(t:get("unexpected")) do table.insert(samples, line) end
  end
  local function count(kind, outcome) return total[kind .. " " .. outcome] or 0 end
  for _, kind in ipairs(kinds) do
    io.write(string.format("soak-count %s %d %d %d\n", kind, count(kind, "ok"),
      count(kind, "expected"), count(kind, "unexpected")))
  end
  if count("unknown", "unexpected") > 0 then
    io.write(string.format("soak-count unknown 0 0 %d\n", count("unknown", "unexpected")))
  end
  local e = summary.errors
  io.write(string.format("soak-transport %d %d %d %d %d %d %.0f\n", summary.requests,
    e.connect, e.read, e.write, e.status, e.timeout, latency:percentile(99)))
  for _, line in ipairs(samples) do io.write("soak-unexpected " .. line .. "\n") end
end

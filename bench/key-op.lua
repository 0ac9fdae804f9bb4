-- wrk request: the JSON-RPC call in $BENCH_BODY with the bearer token in
-- $BENCH_TOKEN, as an attestation-token caller sends it.
wrk.method = "POST"
wrk.headers["Content-Type"] = "application/json"
wrk.headers["Authorization"] = "Bearer " .. os.getenv("BENCH_TOKEN")
wrk.body = os.getenv("BENCH_BODY")

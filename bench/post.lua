-- wrk request: a JSON-RPC call as the daemon's callers send it.
wrk.method = "POST"
wrk.headers["Content-Type"] = "application/json"
wrk.body = '{"jsonrpc":"2.0","id":1,"method":"com.tarsel.orna.kms.key_operation.generate_key",'
  .. '"params":{"provider":"local","keySize":32}}'

#!/bin/sh
# Writes the sample capture session.mrpc to standard output with `sarn encode` (first on PATH):
# a hello, a request and its response, a "multiple" request with three responses, a request update
# and a cancel. Run it again and compare to check the sample.
set -e
body() { printf '%s' "$1"; }
body '{"type": "kernoRpcHello", "identity": ["sarn-example"]}' |
  sarn encode request --rpc-id 0 --response-count none --schema-version 7
body '{"type": "kernoCurrentTimeGet"}' | sarn encode request --rpc-id 1
body '{"type": "kernoCurrentTime", "currentTime": "2026-11-25 19:00:00", "timeZoneOffset": 60}' |
  sarn encode response --rpc-id 1 --final
body '{"type": "tunerStateEventRegister", "bodyId": "tsn:7", "isMonitoring": true}' |
  sarn encode request --rpc-id 2 --response-count multiple --header X-Client=sarn-example
for n in 1 2 3; do
  final=
  [ "$n" = 3 ] && final=--final
  body "{\"type\": \"tunerStateEvent\", \"bodyId\": \"tsn:7\", \"eventTime\": \"2026-11-25 19:00:0$n\", \"sequenceNumber\": $n}" |
    sarn encode response --rpc-id 2 --schema-version 42 $final
done
body '{"type": "tunerStateEventRegister", "bodyId": "tsn:7", "notifyInterval": 5}' |
  sarn encode request-update --rpc-id 2
sarn encode cancel --rpc-id 2

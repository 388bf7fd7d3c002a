# SPDX-License-Identifier: Apache-2.0
"""Twenty short scenarios of one client, each a function of a connected client and the service; each takes whatever
comes back and ends. They leave no session behind but by the end of their connection.
"""

import wire

REPORTER = 7000


def sessions(client, service_type=0, count=1):
    for reporter in range(REPORTER, REPORTER + count):
        client.call(wire.CREATE, reporter)
        client.call(wire.RETYPE, service_type, reporter)
        client.call(wire.CONFIGURE, {"HostApplicationDisplayID": "org.example.scenario", "place": "here"}, reporter)
        client.send(wire.START, reporter)


def play(client, count=4, category=wire.PLAYBACK, kind=wire.PLAYBACK_START, **more):
    for number in range(count):
        client.call(wire.SEND, {"step": number, "text": "s" * 20, **more}, category, kind, [REPORTER])


def create(client, _):
    client.call(wire.CREATE, REPORTER)
    client.call(wire.TYPE_OF, REPORTER)
    client.call(wire.REPORTER, REPORTER)


def retype(client, _):
    client.call(wire.CREATE, REPORTER)
    for service_type in (1, 2, 7):
        client.call(wire.RETYPE, service_type, REPORTER)


def configure(client, _):
    client.call(wire.CREATE, REPORTER)
    client.call(wire.CONFIGURE, {f"key{number}": [number, {"deep": str(number)}] for number in range(40)}, REPORTER)


def start_and_stop(client, _):
    sessions(client)
    client.call(wire.STOP, REPORTER)


def messages(client, _):
    sessions(client)
    play(client)
    client.call(wire.STOP, REPORTER)


def music(client, _):
    sessions(client, 7)
    client.call(wire.SEND, {"session_output_running": True, "KvSessionVolume": 0.5, "active_devices": "Speaker"},
                wire.PLAYBACK, 1, [REPORTER])
    client.call(wire.SEND, {"KvSessionVolume": 0.75}, 14, 0, [REPORTER])
    client.call(wire.SEND, {"session_output_running": False}, wire.PLAYBACK, 2, [REPORTER])
    client.call(wire.STOP, REPORTER)


def test_session(client, _):
    sessions(client, 11)
    play(client)
    client.call(wire.STOP, REPORTER)


def haptics(client, _):
    sessions(client, 3)
    play(client, 2, kind=8, EngineOnTime=1.5, EngineState="EngineOn", ApplicationName="game")
    client.call(wire.STOP, REPORTER)


def issue(client, _):
    sessions(client)
    play(client, 2, category=11, kind=7, issue_type="Silence", node="Out", rtaid_client="org.example.music")
    client.call(wire.STOP, REPORTER)


def no_session(client, _):
    client.call(wire.SEND, {"lonely": 1}, wire.PLAYBACK, 0, None)


def broadcast(client, _):
    sessions(client, count=5)
    for number in range(3):
        client.call(wire.SEND, {"to": "all", "number": number}, wire.PLAYBACK, 1, None)


def many_sessions(client, _):
    sessions(client, count=20)
    client.call(wire.ALL_REPORTERS)
    for reporter in range(REPORTER, REPORTER + 20):
        client.call(wire.DESTROY, reporter)


def large_message(client, _):
    sessions(client)
    client.call(wire.SEND, {f"key{number}": "v" * 500 for number in range(200)}, wire.PLAYBACK, 1, [REPORTER])


def deep_message(client, _):
    sessions(client)
    value = {"end": wire.Date(1.5)}
    for _ in range(50):
        value = {"in": value, "beside": [b"data", 1.25]}
    client.call(wire.SEND, value, wire.PLAYBACK, 1, [REPORTER])


def pipeline(client, _):
    sessions(client)
    numbers = [client.send(wire.SEND, {"number": number}, wire.PLAYBACK, 1, [REPORTER]) for number in range(30)]
    for number in numbers:
        client.reply(number)


def status(client, _):
    client.call(wire.STATUS)
    client.settle()


def refusals(client, _):
    for words in ((99,), (wire.CREATE,), (wire.CREATE, "text"), (wire.SEND, {"a": None}, 1, 1, [1]),
                  (wire.RETYPE, 1 << 40, 1)):
        try:
            client.call(*words)
        except wire.Refused:
            continue
        raise AssertionError(f"{words} was not refused")


def unreadable(client, _):
    client.send_bytes(wire.frame(b"\xff\x00\x01"))
    try:
        client.call(wire.STATUS)
    except wire.WireError:
        return
    raise AssertionError("an unreadable frame didn't end its connection")


def leave(client, _):
    sessions(client, count=3)
    play(client)
    client.send(wire.SEND, {"last": 1}, wire.PLAYBACK, 1, [REPORTER])
    client.close()


def replaced(client, _):
    sessions(client)
    play(client, 2)
    client.call(wire.CREATE, REPORTER)
    client.call(wire.STOP, REPORTER)


SCENARIOS = (create, retype, configure, start_and_stop, messages, music, test_session, haptics, issue, no_session,
             broadcast, many_sessions, large_message, deep_message, pipeline, status, refusals, unreadable, leave,
             replaced)

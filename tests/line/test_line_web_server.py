"""The page's server: who is let in, what every response says, and what a browser may send."""

from __future__ import annotations

import json
import socket
from http.client import HTTPConnection, HTTPResponse
from pathlib import Path
from typing import Any, Iterator, Mapping, Sequence

import pytest
from line_page import ToldLine, until
from line_watch import Watcher

from amt_line.view.web.address import Address, Names, read_address
from amt_line.view.web.live import Pace
from amt_line.view.web.server import Page
from amt_line.view.web.token import kept_token, new_token
from amt_station.errors import UsageProblem

POLICY = ("default-src 'none'; script-src 'self'; style-src 'self'; img-src 'self'; "
          "connect-src 'self'; form-action 'self'; base-uri 'none'; frame-ancestors 'none'")


@pytest.fixture
def line() -> Iterator[ToldLine]:
    """A line that is only told, with its page."""
    told = ToldLine()
    yield told
    told.close()


def ask(page: Page, path: str, method: str = "GET", body: bytes | None = None,
        headers: Mapping[str, str] | None = None) -> tuple[HTTPResponse, bytes]:
    """One request, with the headers of a program unless others are given."""
    connection = HTTPConnection("127.0.0.1", page.port, timeout=60)
    try:
        connection.request(method, path, body, {"Host": f"127.0.0.1:{page.port}",
                                                **(headers or {})})
        response = connection.getresponse()
        return response, response.read()
    finally:
        connection.close()


def say(page: Page, path: str, document: Any, **headers: str) -> tuple[int, Any]:
    """A page's POST; ``headers`` replace those that a page sends."""
    whole = {"Content-Type": "application/json", "Origin": f"http://127.0.0.1:{page.port}",
             **{name.replace("_", "-"): value for name, value in headers.items()}}
    response, body = ask(page, path, "POST", json.dumps(document).encode(),
                         {name: value for name, value in whole.items() if value})
    return response.status, json.loads(body) if body.startswith(b"{") else body.decode()


# where it listens


@pytest.mark.parametrize("text, address", [
    ("8080", Address("127.0.0.1", 8080)), ("0", Address("127.0.0.1", 0)),
    ("0.0.0.0:80", Address("0.0.0.0", 80)), ("localhost:9", Address("localhost", 9)),
    ("[::1]:8080", Address("::1", 8080)), ("station-7:65535", Address("station-7", 65535))])
def test_an_address_is_read(text: str, address: Address) -> None:
    assert read_address(text) == address


@pytest.mark.parametrize("text", ["", "x", ":", "80:", "::1:80", "1:2:3", "65536", "h:99999", "-1",
                                  "a b:é", "http://127.0.0.1:80"])
def test_what_is_no_address_is_refused(text: str) -> None:
    with pytest.raises(UsageProblem, match="a port, or HOST:PORT, is needed"):
        read_address(text)


@pytest.mark.parametrize("host, loopback", [
    ("127.0.0.1", True), ("127.8.8.8", True), ("::1", True), ("localhost", True),
    ("0.0.0.0", False), ("::", False), ("10.0.0.7", False), ("station-7", False)])
def test_only_the_loopback_address_needs_no_token(host: str, loopback: bool) -> None:
    assert Address(host, 80).is_loopback is loopback


def test_a_port_in_use_is_a_clear_error(line: ToldLine) -> None:
    with pytest.raises(UsageProblem, match="the page cannot be served there: Address already"):
        Page(Address(port=line.page.port))


def test_a_host_that_nobody_knows_is_a_clear_error() -> None:
    with pytest.raises(UsageProblem, match="the page cannot be served there"):
        Page(Address("no such host.invalid", 0))


# by which name it is asked for


@pytest.mark.parametrize("host", ["evil.example", "evil.example:8080", "", "localhost.evil.example",
                                  "10.0.0.7", "127.0.0.1.evil.example", "a@127.0.0.1", "[evil]"])
def test_on_the_loopback_address_no_other_name_is_served(line: ToldLine, host: str) -> None:
    for path in ("/", "/live", "/static/line.js"):
        response, body = ask(line.page, path, headers={"Host": host})
        assert (response.status, b"under that name" in body) == (421, True)


@pytest.mark.parametrize("host", ["127.0.0.1", "localhost:8080", "LOCALHOST", "[::1]:8080"])
def test_the_names_of_the_loopback_address_are_served(line: ToldLine, host: str) -> None:
    assert ask(line.page, "/", headers={"Host": host})[0].status == 200


def test_on_another_address_numbers_and_the_own_name_are_served() -> None:
    names = Names(Address("0.0.0.0", 80))
    own = socket.gethostname()
    assert all(names.mean_this(name) for name in ("10.0.0.7:80", "[fe80::1]", own, f"{own}:80"))
    assert not any(names.mean_this(name) for name in ("evil.example", "evil.example:80", ""))


# what every response says


@pytest.mark.parametrize("path, status", [
    ("/", 200), ("/static/line.js", 200), ("/static/nothing.js", 404), ("/nothing", 404),
    ("/runs", 404), ("/static/../server.py", 404), ("/static/%2e%2e%2fserver.py", 404),
    ("/static//etc/passwd", 404), ("/picture/../../etc/passwd", 404), ("/picture/0", 404),
    ("/answer", 405), ("/stop", 405), ("/token", 405)])
def test_every_response_is_guarded(line: ToldLine, path: str, status: int) -> None:
    response, _ = ask(line.page, path)
    said = {name: response.headers[name] for name in (
        "Content-Security-Policy", "X-Content-Type-Options", "X-Frame-Options", "Referrer-Policy",
        "Cross-Origin-Opener-Policy", "Cross-Origin-Resource-Policy", "Server")}
    assert (response.status, said) == (status, {
        "Content-Security-Policy": POLICY, "X-Content-Type-Options": "nosniff",
        "X-Frame-Options": "DENY", "Referrer-Policy": "no-referrer",
        "Cross-Origin-Opener-Policy": "same-origin", "Cross-Origin-Resource-Policy": "same-origin",
        "Server": None})


def test_no_page_holds_code_or_style_of_its_own(line: ToldLine) -> None:
    _, body = ask(line.page, "/", headers={"Accept": "text/html"})
    text = body.decode()
    assert "style=" not in text and "<style" not in text and " onclick" not in text
    assert text.count("<script") == 2, "one is data, one comes from a file"
    assert '<script type="application/json" id="words">' in text
    assert "http://" not in text and "https://" not in text, "nothing comes from a network"


def test_files_are_asked_for_each_time_and_sent_only_when_changed(line: ToldLine) -> None:
    response, body = ask(line.page, "/static/line.js")
    assert response.headers["Content-Type"] == "text/javascript; charset=utf-8" and body
    assert response.headers["Cache-Control"] == "no-cache"
    again, nothing = ask(line.page, "/static/line.js",
                         headers={"If-None-Match": response.headers["ETag"]})
    assert (again.status, nothing) == (304, b"")
    assert ask(line.page, "/")[0].headers["Cache-Control"] == "no-store"


# what a browser may send


def test_an_answer_and_a_stop_need_the_page_and_its_token(line: ToldLine) -> None:
    line.slot("A")
    run = line.began("A")
    asked = line.ask("A", "White?", run=run)
    with Watcher(line.page) as watcher:
        token = watcher.read()["token"]
    page, answer = line.page, {"id": asked.question.id, "text": "yes"}
    for path, document in (("/answer", answer), ("/stop", {"slot": "A", "run": run})):
        for wrong in ({"X_AMT_Token": ""}, {"X_AMT_Token": "x" * 32},
                      {"X_AMT_Token": token, "Origin": ""},
                      {"X_AMT_Token": token, "Origin": "null"},
                      {"X_AMT_Token": token, "Origin": "http://evil.example"},
                      {"X_AMT_Token": token, "Origin": "http://127.0.0.1:1"}):
            assert say(page, path, document, **wrong)[0] == 403
    assert asked.answer is None and not line.stopped
    assert say(page, "/answer", answer, X_AMT_Token=token) == (200, {"ok": True})
    assert (asked.text(), asked.by()) == ("yes", "page")
    assert say(page, "/stop", {"slot": "A", "run": run}, X_AMT_Token=token) == (200, {"ok": True})
    assert line.stopped == ["A"]


def test_only_what_is_asked_is_answered_and_only_what_runs_is_stopped(line: ToldLine) -> None:
    line.slot("A")
    run = line.began("A")
    asked = line.ask("A", "White?", run=run)
    with Watcher(line.page) as watcher:
        token = watcher.read()["token"]

    def status(path: str, document: Any) -> tuple[int, Any]:
        return say(line.page, path, document, X_AMT_Token=token)

    gone = {"ok": False, "problem": "gone", "text": ""}
    question = asked.question.id
    assert status("/answer", {"id": question, "text": "perhaps"}) == (
        422, {"ok": False, "problem": "unfit", "text": "yes or no is needed"})
    assert status("/answer", {"id": question, "text": "y" * 5000})[0] == 422
    assert status("/answer", {"id": "none", "text": "yes"}) == (409, gone)
    assert status("/stop", {"slot": "A", "run": "another"}) == (409, gone)
    assert status("/stop", {"slot": "B", "run": ""}) == (409, gone)
    asked.give_up()
    assert status("/answer", {"id": question, "text": "yes"}) == (409, gone)
    assert line.stopped == []


@pytest.mark.parametrize("body, kind, status", [
    (b"{}", "application/json", 400), (b"[]", "application/json", 400),
    (b"x", "application/json", 400), (b'{"id": 1, "text": "yes"}', "application/json", 400),
    (b"\xff", "application/json", 400), (b"[" * 60000, "application/json", 400),
    (b"id=1&text=yes", "application/x-www-form-urlencoded", 415),
    (b'"' + b"x" * 70000 + b'"', "application/json", 413)])
def test_what_is_no_answer_is_refused(line: ToldLine, body: bytes, kind: str, status: int) -> None:
    with Watcher(line.page) as watcher:
        token = watcher.read()["token"]
    response, _ = ask(line.page, "/answer", "POST", body, {
        "Content-Type": kind, "Origin": f"http://127.0.0.1:{line.page.port}",
        "X-AMT-Token": token})
    assert response.status == status


def test_a_picture_is_that_of_an_open_question_and_nothing_else(line: ToldLine,
                                                                tmp_path: Path) -> None:
    picture, secret = tmp_path / "white.png", tmp_path / "secret.txt"
    picture.write_bytes(b"\x89PNG picture")
    secret.write_text("secret")
    asked = line.ask("A", "White?", picture=picture)
    other = line.ask("B", "White?", picture=secret)
    away = line.ask("C", "White?", picture=tmp_path / "away.png")
    response, body = ask(line.page, f"/picture/{asked.question.id}")
    assert (response.status, body) == (200, b"\x89PNG picture")
    assert response.headers["Content-Type"] == "image/png"
    for question in (other, away):
        assert ask(line.page, f"/picture/{question.question.id}")[0].status == 404
    asked.give_up()
    assert ask(line.page, f"/picture/{asked.question.id}")[0].status == 404
    other.give_up()
    away.give_up()


# who comes from another machine


def test_on_another_address_a_token_is_needed(tmp_path: Path) -> None:
    token = kept_token(tmp_path / "state" / "token")
    line = ToldLine(access=token)
    try:
        for path in ("/", "/live", "/picture/0", "/nothing"):
            response, body = ask(line.page, path)
            assert (response.status, token.encode() in body) == (401, False)
        for wrong in ("", "x", token[:-1], token + "x", "\u00e9"):
            assert ask(line.page, f"/?token={wrong.encode().hex()}")[0].status == 401
        assert ask(line.page, "/", headers={"Cookie": "amt-token=wrong"})[0].status == 401
        assert ask(line.page, "/static/house.css")[0].status == 200
        response, body = ask(line.page, f"/?token={token}", headers={"Accept": "text/html"})
        assert response.status == 200 and b'http-equiv="refresh"' in body
        cookie = response.headers["Set-Cookie"]
        assert cookie.startswith(f"amt-token={token}; HttpOnly;") and "SameSite=Strict" in cookie
        assert ask(line.page, "/", headers={"Cookie": f"amt-token={token}"})[0].status == 200
        assert say(line.page, "/answer", {"id": "", "text": ""},
                   Cookie=f"amt-token={token}")[0] == 403
    finally:
        line.close()


def test_a_token_may_be_typed(tmp_path: Path) -> None:
    token = new_token()
    line = ToldLine(access=token)
    try:
        form = {"Content-Type": "application/x-www-form-urlencoded", "Accept": "text/html"}
        response, body = ask(line.page, "/", headers={"Accept": "text/html"})
        assert response.status == 401 and b'action="/token"' in body
        response, _ = ask(line.page, "/token", "POST", b"token=wrong", form)
        assert (response.status, response.headers["Set-Cookie"]) == (401, None)
        response, _ = ask(line.page, "/token", "POST",
                          f"token=+{token.upper()}+".encode(), form)
        assert response.status == 200 and token in response.headers["Set-Cookie"]
    finally:
        line.close()


def test_a_token_is_made_once_and_kept_from_others(tmp_path: Path) -> None:
    path = tmp_path / "state" / "token"
    token = kept_token(path)
    assert kept_token(path) == token and new_token() != token
    assert path.stat().st_mode & 0o777 == 0o600
    path.write_text("short\n")
    with pytest.raises(UsageProblem, match="holds no token; remove the file"):
        kept_token(path)
    with pytest.raises(UsageProblem, match="cannot be kept"):
        kept_token(Path("/proc/none/token"))


# nothing is left behind


def test_a_page_that_is_closed_leaves_nothing(line: ToldLine) -> None:
    import threading

    with Watcher(line.page) as watcher:
        watcher.read()
        line.close()
        assert watcher.kinds()[-1] == "bye"
    assert not any(thread.name.startswith("page") for thread in threading.enumerate())
    with pytest.raises(ConnectionRefusedError):
        ask(line.page, "/")
    line.slot("A")
    assert line.stream.failure is None, "a page that is closed is no failure of the line"
    again = ToldLine(port=line.page.port)
    again.close()


def closed(connections: Sequence[socket.socket]) -> int:
    """How many of them the server has closed."""
    count = 0
    for connection in connections:
        try:
            count += connection.recv(1, socket.MSG_PEEK) == b""
        except BlockingIOError:
            pass
        except ConnectionResetError:
            count += 1
    return count


def test_connections_are_bounded() -> None:
    line = ToldLine(pace=Pace(beat=0.2))
    idle: list[socket.socket] = []

    def is_full() -> bool:
        # One after the other: what comes at once may be lost before the server sees it.
        idle.append(socket.create_connection(("127.0.0.1", line.page.port), timeout=60))
        idle[-1].setblocking(False)
        return closed(idle) > 0

    def is_let_in() -> bool:
        # The server learns of each end only when it looks there.
        try:
            with Watcher(line.page) as late:
                return late.read()["slots"] == []
        except (ConnectionError, IndexError):
            return False

    try:
        until(is_full, "one too many is closed")
        assert len(idle) > 256
        while idle:
            idle.pop().close()
        until(is_let_in, "there is room again")
    finally:
        for connection in idle:
            connection.close()
        line.close()


def test_browsers_are_bounded() -> None:
    line = ToldLine(pace=Pace(beat=0.2, browsers=3))
    try:
        watchers = [Watcher(line.page) for _ in range(3)]
        for watcher in watchers:
            watcher.read()
        assert ask(line.page, "/live")[0].status == 503
        watchers.pop().close()
        until(lambda: line.page.watching == 2, "a browser that went away")
        with Watcher(line.page) as late:
            assert late.read()["slots"] == []
        line.slot("A")
        assert watchers[0].read()["slots"][0]["slot"] == "A", "whoever watches goes on"
        for watcher in watchers:
            watcher.close()
        until(lambda: line.page.watching == 0, "all browsers gone")
    finally:
        line.close()

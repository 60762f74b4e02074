"""tav view: what a page and its browser get, and that nobody else gets anything."""
import contextlib
import html
import http.client
import os
import pathlib
import re
import signal
import socket
import subprocess
import unittest

from support import EMULATOR, PATIENCE, TAV, WINDOWS, ToolTest, tav, until

PAGE = """<!doctype html><meta http-equiv="Content-Security-Policy" content="default-src 'none'; connect-src 'none'">
<meta name="tav-view" content=""><title>a page</title>"""
NAME = 'a "b" <c> & d.tav' if not WINDOWS else "a & d.tav"


class ViewTest(ToolTest):
    def setUp(self):
        super().setUp()
        self.page = self.folder / "page.html"
        self.page.write_text(PAGE)
        self.path = self.folder / NAME
        self.snapshot().rename(self.path)
        self.content = self.path.read_bytes()

    def view(self, *words, environment=None):
        """Starts it; `address` is what it prints."""
        process = subprocess.Popen([*TAV, "view", self.path, "--page", self.page, *words], stdout=subprocess.PIPE,
                                   stderr=subprocess.PIPE, env={**os.environ, **(environment or {})}, text=True)
        self.addCleanup(lambda: (process.kill(), process.communicate()))
        address = process.stdout.readline()
        found = re.fullmatch(r"http://(127\.0\.0\.1):(\d+)(/[0-9a-f]{32}/)\n", address)
        self.assertTrue(found, address)
        self.host, self.port, self.inside = found[1], int(found[2]), found[3]
        return process

    def ask(self, target, method="GET", headers=None, body=None):
        """A request by the rules; the answer, with its body as `content`."""
        with contextlib.closing(http.client.HTTPConnection(self.host, self.port, timeout=PATIENCE)) as connection:
            connection.request(method, target, body, headers or {})
            answer = connection.getresponse()
            answer.content = answer.read()
            return answer

    def say(self, *pieces):
        """Bytes as they are, on a connection of their own; all that is answered until it ends."""
        with socket.create_connection((self.host, self.port), timeout=PATIENCE) as connection:
            for piece in pieces:
                connection.sendall(piece)
            connection.shutdown(socket.SHUT_WR)
            return b"".join(iter(lambda: connection.recv(65536), b""))


class Answers(ViewTest):
    def test_the_page_is_told_its_file_and_its_one_address(self):
        self.view("--no-open")
        answer = self.ask(self.inside)
        self.assertEqual((answer.status, answer.getheader("Content-Type")), (200, "text/html; charset=utf-8"))
        self.assertEqual(answer.getheader("Referrer-Policy"), "no-referrer")
        self.assertEqual(answer.getheader("Cache-Control"), "no-store")
        page = answer.content.decode()
        self.assertIn(f"connect-src http://{self.host}:{self.port}{self.inside}\"", page)
        self.assertEqual(html.unescape(re.search(r'name="tav-view" content="([^"]*)"', page)[1]), NAME)
        self.assertNotIn("<c>", page)

    def test_ranges_are_those_of_the_file(self):
        self.view("--no-open")
        size = len(self.content)
        whole = self.ask(self.inside + "file")
        self.assertEqual((whole.status, whole.content), (200, self.content))
        tag = whole.getheader("ETag")
        head = self.ask(self.inside + "file", "HEAD")
        self.assertEqual((head.status, head.content, int(head.getheader("Content-Length"))), (200, b"", size))
        for text, first, last in (("0-0", 0, 0), ("0-99", 0, 99), ("100-", 100, size - 1), ("-7", size - 7, size - 1),
                                  (f"-{size + 9}", 0, size - 1), (f"{size - 1}-{size + 1000}", size - 1, size - 1)):
            with self.subTest(range=text):
                answer = self.ask(self.inside + "file", headers={"Range": "bytes=" + text, "If-Match": tag})
                self.assertEqual((answer.status, answer.content), (206, self.content[first:last + 1]))
                self.assertEqual(answer.getheader("Content-Range"), f"bytes {first}-{last}/{size}")

    def test_a_file_larger_than_what_is_sent_at_once_comes_whole(self):
        content = self.content + os.urandom(9 << 20)
        self.path.write_bytes(content)
        self.view("--no-open")
        self.assertEqual(self.ask(self.inside + "file").content, content)

    def test_a_connection_takes_one_request_after_another(self):
        self.view("--no-open")
        one = f"GET {self.inside}file HTTP/1.1\r\nHost: {self.host}:{self.port}\r\nRange: bytes=%d-%d\r\n\r\n"
        said = self.say((one % (0, 7) + one % (8, 15)).encode() + (one % (16, 16)).encode())
        bodies = [part.partition(b"\r\n\r\n")[2] for part in said.split(b"HTTP/1.1 206")[1:]]
        self.assertEqual(bodies, [self.content[0:8], self.content[8:16], self.content[16:17]])

    def test_a_request_may_come_byte_by_byte(self):
        self.view("--no-open")
        whole = f"GET {self.inside} HTTP/1.1\r\nHost: {self.host}:{self.port}\r\n\r\n".encode()
        self.assertTrue(self.say(*(whole[i:i + 1] for i in range(len(whole)))).startswith(b"HTTP/1.1 200 "))

    def test_who_says_nothing_keeps_nobody_waiting(self):
        self.view("--no-open")
        with contextlib.ExitStack() as silent:
            for _ in range(200):  # more than it keeps
                connection = silent.enter_context(socket.create_connection((self.host, self.port), timeout=PATIENCE))
                connection.sendall(b"GET /")
            self.assertEqual(self.ask(self.inside + "file").content, self.content)

    def test_a_file_that_has_changed_is_told_until_the_page_is_loaded_again(self):
        self.view("--no-open")
        tag = self.ask(self.inside + "file", "HEAD").getheader("ETag")
        self.path.write_bytes(self.content + self.content)
        self.assertEqual(self.ask(self.inside + "file", headers={"If-Match": tag}).status, 412)
        self.assertEqual(self.ask(self.inside).status, 200)
        self.assertEqual(self.ask(self.inside + "file", headers={"If-Match": tag}).status, 412)
        self.assertEqual(self.ask(self.inside + "file").content, self.content + self.content)

    @unittest.skipIf(WINDOWS, "an open file stays there")
    def test_a_file_that_is_gone_is_not_found(self):
        self.view("--no-open")
        tag = self.ask(self.inside + "file", "HEAD").getheader("ETag")
        self.path.unlink()
        self.assertEqual(self.ask(self.inside + "file", headers={"If-Match": tag}).status, 412)
        self.assertEqual(self.ask(self.inside + "file").status, 404)
        self.assertEqual(self.ask(self.inside).status, 200)


class Refusals(ViewTest):
    def setUp(self):
        super().setUp()
        self.process = self.view("--no-open")
        self.there = f"Host: {self.host}:{self.port}\r\n"

    def tearDown(self):
        self.assertEqual(self.ask(self.inside + "file").content, self.content, "it goes on")
        self.assertIsNone(self.process.poll())

    def statuses(self, said):
        return [int(status) for status in re.findall(rb"^HTTP/1\.1 (\d{3}) ", said, re.M)]

    def test_without_the_token_nothing_is_there(self):
        wrong = self.inside[:-2] + ("0" if self.inside[-2] != "0" else "1") + "/"
        for target in ("/", "/file", "/favicon.ico", wrong, wrong + "file", self.inside[:-1], self.inside.upper() + "x",
                       "//" + self.inside, "/." + self.inside, "/x/.." + self.inside, self.inside + "x",
                       self.inside + "../", self.inside + "file/../file", self.inside + "file?x", self.inside + "file%00",
                       self.inside + "%66ile", self.inside + "//etc/passwd", self.inside + "../../../etc/passwd"):
            with self.subTest(target=target):
                answer = self.ask(target)
                self.assertEqual(answer.status, 404)
                self.assertNotIn(self.inside.strip("/").encode(), answer.content)

    def test_other_hosts_and_origins_are_refused(self):
        own = f"{self.host}:{self.port}"
        for host in ("example.com", f"example.com:{self.port}", f"localhost:{self.port}", self.host, f"{self.host}:1",
                     f"{own}.example.com", f"[::1]:{self.port}", f"x@{own}"):
            with self.subTest(host=host):
                self.assertEqual(self.ask(self.inside, headers={"Host": host}).status, 421)
        for origin in ("http://example.com", "null", f"https://{own}", f"http://{own}.example.com", f"http://localhost:{self.port}"):
            with self.subTest(origin=origin):
                self.assertEqual(self.ask(self.inside + "file", headers={"Origin": origin}).status, 403)
        for site in ("cross-site", "same-site", "Same-Origin"):
            with self.subTest(site=site):
                self.assertEqual(self.ask(self.inside + "file", headers={"Sec-Fetch-Site": site}).status, 403)
        own_fields = {"Origin": f"http://{own}", "Sec-Fetch-Site": "same-origin"}
        self.assertEqual(self.ask(self.inside + "file", headers=own_fields).status, 200)

    def test_only_get_and_head_are_methods(self):
        for method in ("POST", "PUT", "DELETE", "OPTIONS", "TRACE", "PATCH", "get", "X"):
            with self.subTest(method=method):
                answer = self.ask(self.inside + "file", method)
                self.assertEqual((answer.status, answer.getheader("Allow")), (405, "GET, HEAD"))
        self.assertEqual(self.statuses(self.say(f"CONNECT {self.host}:1 HTTP/1.1\r\n{self.there}\r\n".encode())), [400])

    def test_a_request_with_a_body_is_refused_and_what_follows_is_not_looked_at(self):
        inner = f"GET {self.inside}file HTTP/1.1\r\n{self.there}\r\n"
        for fields in (f"Content-Length: {len(inner)}\r\n", "Transfer-Encoding: chunked\r\n",
                       f"Content-Length: 0\r\nContent-Length: {len(inner)}\r\n", "Content-Length: +0\r\n"):
            with self.subTest(fields=fields):
                said = self.say(f"GET {self.inside}file HTTP/1.1\r\n{self.there}{fields}\r\n{inner}".encode())
                self.assertEqual(self.statuses(said), [400])

    def test_what_is_no_request_is_refused(self):
        line = f"GET {self.inside} HTTP/1.1\r\n"
        for text in ("\r\n\r\n", "GET\r\n\r\n", "GET /\r\n\r\n", f"GET  {self.inside} HTTP/1.1\r\n{self.there}\r\n",
                     f"GET {self.inside}  HTTP/1.1\r\n{self.there}\r\n", f"GET http://{self.host}/ HTTP/1.1\r\n{self.there}\r\n",
                     f"GET {self.inside} HTTP/1.1 x\r\n{self.there}\r\n", f"GET {self.inside} HTTQ/1.1\r\n{self.there}\r\n",
                     line + "\r\n", line + "Host:\r\n\r\n", line + self.there + self.there + "\r\n",
                     line + f" {self.there}\r\n", line + self.there + "X : y\r\n\r\n", line + self.there + ": y\r\n\r\n",
                     line + self.there + " folded\r\n\r\n", line + self.there + "X: a\0b\r\n\r\n",
                     line + self.there + "X: a\nHost: b\r\n\r\n", line + self.there + "X: a\rb\r\n\r\n",
                     line + self.there + "Range: bytes=0-1\r\nRange: bytes=0-2\r\n\r\n", f"G\0T / HTTP/1.1\r\n{self.there}\r\n",
                     f"GET /\xff HTTP/1.1\r\n{self.there}\r\n", "\x16\x03\x01\x02\x00\x01\x00\x01\xfc\x03\x03\r\n\r\n"):
            with self.subTest(text=text):
                self.assertEqual(self.statuses(self.say(text.encode("latin-1"))), [400])
        for version in ("1.0", "2.0", "0.9", "1.2"):
            self.assertEqual(self.statuses(self.say(f"GET {self.inside} HTTP/{version}\r\n{self.there}\r\n".encode())), [505])

    def test_a_request_without_an_end_is_no_request(self):
        self.assertEqual(self.say(), b"")
        self.assertEqual(self.say(f"GET {self.inside} HTTP/1.1\r\n{self.there}".encode()), b"")
        self.assertEqual(self.say(f"GET {self.inside} HTTP/1.1\n{self.there}\n\n".encode()), b"")

    def test_a_head_that_is_too_long_is_refused(self):
        for text in ("x" * 20000, f"GET {self.inside} HTTP/1.1\r\n{self.there}X: {'y' * 17000}\r\n\r\n",
                     f"GET {self.inside} HTTP/1.1\r\n" + "X: y\r\n" * 4000 + "\r\n", "GET /" + "z" * 200000):
            self.assertEqual(self.statuses(self.say(text.encode())), [431])

    def test_ranges_that_are_none_are_refused(self):
        size = len(self.content)
        for text in ("", "bytes", "bytes=", "bytes=-", "bytes=x-y", "bytes=5-4", "bytes=0-1,3-4", "bytes= 0-1", "lines=0-1",
                     "bytes=--1", "bytes=0x0-1", "bytes=1", "bytes=18446744073709551616-", "bytes=0-18446744073709551616"):
            with self.subTest(range=text):
                self.assertEqual(self.ask(self.inside + "file", headers={"Range": text}).status, 400)
        for text in (f"bytes={size}-", f"bytes={size}-{size + 1}", "bytes=-0", "bytes=18446744073709551615-"):
            with self.subTest(range=text):
                answer = self.ask(self.inside + "file", headers={"Range": text})
                self.assertEqual((answer.status, answer.getheader("Content-Range")), (416, f"bytes */{size}"))

    def test_bytes_at_random_do_no_harm(self):
        for seed in range(200):
            noise = bytes((seed * 7919 + i * i * 104729 + (i >> 3)) >> 4 & 0xFF for i in range(seed * 5 + 1))
            self.assertNotIn(200, self.statuses(self.say(noise + b"\r\n\r\n")))


class Ends(ViewTest):
    def test_it_ends_when_the_last_page_has_said_goodbye(self):
        process = self.view("--no-open")
        for what in ("hello", "hello", "bye"):
            self.assertEqual(self.ask(self.inside + what).status, 204)
        self.assertEqual(self.ask(self.inside).status, 200)
        self.assertIsNone(process.poll())
        self.ask(self.inside + "bye")
        self.assertEqual(process.wait(timeout=PATIENCE), 0)
        self.assertEqual(process.stderr.read(), "")

    @unittest.skipIf(WINDOWS, "signals of other processes")
    def test_it_ends_at_an_interrupt(self):
        process = self.view("--no-open")
        process.send_signal(signal.SIGINT)
        self.assertEqual((process.wait(timeout=PATIENCE), process.stderr.read()), (0, ""))

    @unittest.skipIf(WINDOWS or EMULATOR, "its browser is no program of the tests")
    def test_a_browser_is_given_a_way_in_that_works_once(self):
        seen = self.folder / "seen"
        browser = self.folder / "browser"
        browser.write_text(f'#!/bin/sh\nprintf "%s\\n" "$@" >"{seen}.part"\nmv "{seen}.part" "{seen}"\n')
        browser.chmod(0o755)
        self.view(environment={"BROWSER": f"'{browser}' --new %s"})
        until(seen.exists)
        option, address = seen.read_text().split()
        self.assertEqual(option, "--new")
        once = re.fullmatch(rf"http://127\.0\.0\.1:{self.port}(/[0-9a-f]{{32}}/)", address)[1]
        self.assertNotEqual(once, self.inside)
        self.assertEqual(self.ask(once + "file").status, 404)
        answer = self.ask(once)
        self.assertEqual((answer.status, answer.getheader("Location")), (303, self.inside))
        self.assertEqual(self.ask(once).status, 404)
        self.assertEqual(self.ask(self.inside).status, 200)

    @unittest.skipIf(WINDOWS or EMULATOR, "its browser is no program of the tests")
    def test_without_a_browser_it_goes_on(self):
        process = self.view(environment={"BROWSER": "false", "PATH": str(self.folder)})
        self.assertIn("no browser could be started", process.stderr.readline())
        self.assertEqual(self.ask(self.inside).status, 200)


class Misuse(ViewTest):
    def test_what_is_no_stream_is_told_before_anything_is_served(self):
        plain = self.folder / "plain"
        for content in (b"", b"just a text\n"):
            plain.write_bytes(content)
            result = tav("view", plain, "--no-open", "--page", self.page)
            self.assertEqual((result.status, result.out), (3, ""))
        for words in (("-",), (self.folder / "missing",), (self.folder,)):
            result = tav("view", *words, "--no-open", "--page", self.page)
            self.assertEqual((result.status, result.out), (2, ""), words)

    def test_a_page_that_is_none_is_told(self):
        for content in ("", "<html>", PAGE.replace("tav-view", "x"), PAGE.replace("connect-src 'none'", "connect-src *")):
            self.page.write_text(content)
            result = tav("view", self.path, "--no-open", "--page", self.page)
            self.assertEqual((result.status, result.out), (2, ""))
            self.assertIn("page.html", result.err)
        self.assertEqual(tav("view", self.path, "--no-open", "--page", self.folder / "missing").status, 2)

    def test_where_the_page_comes_from_is_told_where_it_is_missing(self):
        if (pathlib.Path(TAV[-1]).resolve().parent / "../share/tav/tav.html").exists():
            self.skipTest("this build has the page")
        result = tav("view", self.path, "--no-open")
        self.assertEqual((result.status, result.out), (2, ""))
        self.assertIn("web/build.sh", result.err)


if __name__ == "__main__":
    unittest.main()

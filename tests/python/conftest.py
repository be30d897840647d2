"""Shared fixtures: one metamodel per test session (the registry is process-wide), fresh
models and repositories per test, and a kiv-serve child process for the network tests."""

import os
import re
import subprocess
import threading

import pytest

import kiv


@pytest.fixture(scope="session")
def shelf():
    """Package "shelf": Shelf{name, books: ordered containment of Book}, Book{title,
    pages, genre, tags: set of String, sequel: optional Book, shelf: opposite of books,
    born: DateTime, id: UUID, extra: JsonValue}."""
    mm = kiv.Metamodel("shelf", "/tests/python/shelf")
    genre = mm.add_enum("Genre", ["Fiction", "Science"])
    book = mm.add_class("Book")
    shelf_class = mm.add_class("Shelf")
    book.add_property("title", "String")
    book.add_property("pages", "Integer", default=100)
    book.add_property("genre", genre)
    book.add_property("tags", "String", kind="set")
    book.add_property("sequel", book, kind="optional")
    book.add_property("shelf", shelf_class, kind="optional", opposite="books")
    book.add_property("born", "DateTime", kind="optional")
    book.add_property("id", "UUID", kind="optional")
    book.add_property("extra", "JsonValue", kind="optional")
    book.add_property("done", "Boolean")
    shelf_class.add_property("name", "String")
    shelf_class.add_property("books", book, kind="sequence", composite=True, opposite="shelf")
    return mm.register()


@pytest.fixture
def repository():
    """An initialised local repository over a fresh user model, and its workspace."""
    repositories, user = kiv.Model(), kiv.Model()
    repo = kiv.LocalRepository.create(repositories, user)
    repo.init()
    return repo, repo.workspace(user), user


class Server:
    def __init__(self, program):
        self.process = subprocess.Popen([program, "--port", "0"], stdout=subprocess.PIPE, text=True)
        line = [None]

        def read():
            line[0] = self.process.stdout.readline()

        reader = threading.Thread(target=read, daemon=True)
        reader.start()
        reader.join(10)
        match = re.search(r"ws://[^/\s]+:\d+/", line[0] or "")
        if not match:
            self.stop()
            raise RuntimeError(f"kiv-serve said {line[0]!r}")
        self.url = match.group(0)

    def stop(self):
        self.process.terminate()
        try:
            self.process.wait(10)
        except subprocess.TimeoutExpired:
            self.process.kill()


@pytest.fixture
def server():
    program = os.environ.get("KIV_SERVE")
    if not program:
        pytest.skip("KIV_SERVE names no kiv-serve program")
    running = Server(program)
    yield running
    running.stop()

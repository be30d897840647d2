"""Models, elements and transactions from Python: values both ways, collections as live
views, and exact cancel on an exception."""

import datetime
import uuid

import pytest

import kiv


def make_book(shelf, model, title="Dune"):
    book = model.create(shelf["Book"])
    book.title = title
    return book


@pytest.mark.parametrize(
    "prop, value",
    [
        ("title", "Dune ☉ 砂丘"),
        ("pages", 612),
        ("pages", -2**31),
        ("genre", "Science"),
        ("done", True),
        ("born", datetime.datetime(1965, 8, 1, 12, 30, 5, 250000)),
        ("id", uuid.UUID("12345678-1234-5678-1234-567812345678")),
        ("extra", {"isbn": "0-441-17271-7", "prints": [1, 2, 3], "nested": {"ok": None}}),
    ],
)
def test_a_value_set_reads_back_equal(shelf, prop, value):
    model = kiv.Model()
    with model.transaction():
        book = make_book(shelf, model)
        book[prop] = value
    assert book[prop] == value
    assert getattr(book, prop) == value


@pytest.mark.parametrize(
    "prop, value, error",
    [
        ("title", 3, TypeError),
        ("pages", "many", TypeError),
        ("pages", 2**31, ValueError),
        ("pages", True, TypeError),
        ("done", 1, TypeError),
        ("genre", "Poetry", kiv.InvalidValue),
        ("sequel", "Dune", TypeError),
        ("nothing", 1, kiv.NoSuchProperty),
    ],
)
def test_a_bad_value_is_refused_and_the_transaction_cancelled(shelf, prop, value, error):
    model = kiv.Model()
    with model.transaction():
        book = make_book(shelf, model)
    with pytest.raises(error):
        with model.transaction():
            book.pages = 300
            book[prop] = value
    assert book.pages == 100  # the default, untouched by the cancelled transaction


def test_an_exception_in_a_transaction_restores_the_model_exactly(shelf):
    model = kiv.Model()
    with model.transaction():
        home = model.create(shelf["Shelf"])
        home.name = "home"
        home.books.append(make_book(shelf, model, "Dune"))
        home.books.append(make_book(shelf, model, "Emma"))
    before = model.to_json()
    with pytest.raises(RuntimeError):
        with model.transaction():
            home.books[0].title = "changed"
            home.books[1].destroy()
            home.books.append(make_book(shelf, model, "new"))
            raise RuntimeError("abandon")
    assert model.to_json() == before
    assert [b.title for b in home.books] == ["Dune", "Emma"]


def test_collections_are_live_views_with_opposites(shelf):
    model = kiv.Model()
    with model.transaction():
        home = model.create(shelf["Shelf"])
        dune, emma = make_book(shelf, model, "Dune"), make_book(shelf, model, "Emma")
        home.books = [dune]
        home.books.insert(0, emma)
        dune.tags = {"desert", "politics"}
        dune.tags.add("classic")
        dune.sequel = emma
    assert [b.title for b in home.books] == ["Emma", "Dune"]
    assert dune.shelf == home and dune.container == home
    assert dune.tags == {"desert", "politics", "classic"} and "desert" in dune.tags
    assert dune.sequel == emma and emma.sequel is None
    with model.transaction():
        dune.tags.remove("politics")
        del home.books[0]
    assert dune.tags == {"desert", "classic"}
    assert list(home.books) == [dune] and emma.container is None and emma.shelf is None
    with pytest.raises(ValueError):
        with model.transaction():
            dune.tags.remove("absent")


def test_a_document_round_trips_through_a_second_model(shelf):
    model = kiv.Model()
    with model.transaction():
        book = make_book(shelf, model)
        book.extra = {"a": [1, 2]}
    copy = kiv.Model()
    copy.load_json(model.to_json())
    found = copy.find(book.uuid)
    assert found.title == "Dune" and found.extra == {"a": [1, 2]} and found.uuid == book.uuid


def test_errors_carry_catalog_key_and_arguments(shelf):
    model = kiv.Model()
    with model.transaction():
        book = make_book(shelf, model)
    with pytest.raises(kiv.Error) as raised:
        book.get("nothing")
    error = raised.value
    assert isinstance(error, kiv.NoSuchProperty)
    assert (error.catalog, error.key) == ("qf0:messages", "NoSuchProperty")
    assert error.args == ("shelf.Book", "nothing")
    assert "nothing" in str(error)


def test_a_metamodel_loads_from_the_generator_description(tmp_path):
    description = {
        "packages": [{"name": "loaded", "uri": "/tests/python/loaded"}],
        "enums": [{"name": "Mood", "literals": [["Calm", 0], ["Busy", 1]]}],
        "classes": [
            {"name": "Task", "super": "Item", "properties": [
                {"name": "mood", "type": "Mood"},
                {"name": "steps", "kind": "sequence", "type": "String"},
                {"name": "owner", "kind": "optional", "type": "Person", "opposite": "tasks"}]},
            {"name": "Item", "abstract": True, "properties": [{"name": "label", "type": "String"}]},
            {"name": "Person", "properties": [
                {"name": "name", "type": "String"},
                {"name": "tasks", "kind": "map", "type": "Task", "key": "label", "opposite": "owner"}]},
        ],
    }
    path = tmp_path / "loaded.json"
    path.write_text(__import__("json").dumps(description))
    mm = kiv.Metamodel.from_description(path)
    assert [p.name for p in kiv.meta_class("loaded.Task").properties] == ["label", "mood", "steps", "owner"]
    model = kiv.Model()
    with model.transaction():
        ann = model.create("loaded.Person")
        task = model.create(mm["Task"])
        task.label, task.mood, task.steps = "write", "Busy", ["draft", "edit"]
        ann.tasks.add(task)
    assert task.owner == ann and ann.tasks["write"] == task and list(task.steps) == ["draft", "edit"]


def test_the_interpreter_exits_cleanly_with_models_and_repositories_alive():
    script = """
import kiv
mm = kiv.Metamodel("exiting", "/tests/python/exiting")
mm.add_class("Thing").add_property("name", "String")
mm.register()
repositories, user = kiv.Model(), kiv.Model()
origin = kiv.LocalRepository.create(repositories, kiv.Model())
origin.init(bare=True)
clone = origin.clone()
workspace = clone.workspace(user)
clone.start_observing_origin(lambda pull: None)
workspace.commit_transaction(lambda: user.create(mm["Thing"]).set("name", "left behind"))
print("done")
"""
    import subprocess
    import sys
    finished = subprocess.run([sys.executable, "-c", script], capture_output=True, text=True, timeout=60)
    assert (finished.returncode, finished.stdout.strip()) == (0, "done"), finished.stderr

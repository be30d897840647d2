"""The version-control API from Python: the same documents as the C++ API for one scripted
session, the same conflicts, errors from the catalog, notices on a worker thread, and a
round trip through a kiv-serve."""

import json
import os
import queue
import subprocess
import uuid

import pytest

import kiv


@pytest.fixture(scope="module")
def cards():
    mm = kiv.Metamodel("parity", "/tests/python/parity")
    card = mm.add_class("Card")
    card.add_property("title", "String")
    card.add_property("points", "Integer")
    card.add_property("tags", "String", kind="set")
    return mm.register()


def card_id(n):
    return uuid.UUID(f"00000000-0000-4000-8000-00000000000{n}")


def python_session(cards):
    """The steps of parity_session.cpp; yields (step, document) and finally the conflicts."""
    repositories, user = kiv.Model(), kiv.Model()
    repository = kiv.LocalRepository.create(repositories, user)
    repository.init()
    workspace = repository.workspace(user)
    steps = []

    def show(step):
        steps.append({"step": step, "document": user.to_json()})

    def card(n):
        return user.find(card_id(n))

    def three_cards():
        for n, title in ((1, "Login"), (2, "Search"), (3, "Export")):
            made = user.create(cards["Card"], card_id(n))
            made.title, made.points = title, n

    workspace.commit_transaction(three_cards)
    show("three cards")

    def edit_and_delete():
        card(1).points = 8
        card(3).destroy()

    workspace.commit_transaction(edit_and_delete)
    show("edit and delete")
    workspace.undo()
    show("undo")
    workspace.redo()
    show("redo")
    workspace.branch("side")
    workspace.checkout("side")

    def side_edits():
        card(1).title = "Sign in"
        card(2).tags.add("backend")

    workspace.commit_transaction(side_edits)
    show("side edits")
    workspace.checkout("master")
    show("back on master")

    def master_edits():
        card(1).title = "Log in"
        card(2).points = 5

    workspace.commit_transaction(master_edits)
    show("master edits")
    conflicts = workspace.merge("side", tool="property")
    show("merged")
    for conflict in conflicts:
        conflict["element"] = str(conflict["element"])
    steps.append({"conflicts": conflicts})
    return steps


def test_a_scripted_session_leaves_the_same_documents_and_conflicts_as_in_cpp(cards):
    program = os.environ.get("KIV_PARITY")
    if not program:
        pytest.skip("KIV_PARITY names no parity program")
    cpp = [json.loads(line) for line in subprocess.run([program], capture_output=True, text=True, check=True,
                                                        timeout=60).stdout.splitlines()]
    python = python_session(cards)
    assert [s.get("step") for s in python] == [s.get("step") for s in cpp]
    for ours, theirs in zip(python, cpp):
        assert ours == theirs, ours.get("step", "conflicts")
    assert python[-1]["conflicts"], "the session's merge has a conflict on Card 1's title"


def test_an_exception_in_commit_transaction_cancels_and_propagates_unchanged(cards, repository):
    repo, workspace, user = repository

    def first():
        user.create(cards["Card"]).title = "kept"

    workspace.commit_transaction(first)
    tip = repo.head.tip
    before = user.to_json()

    class Abandoned(Exception):
        pass

    def failing():
        user.create(cards["Card"]).title = "lost"
        raise Abandoned("no")

    with pytest.raises(Abandoned) as raised:
        workspace.commit_transaction(failing)
    assert str(raised.value) == "no"
    assert user.to_json() == before and repo.head.tip == tip
    workspace.undo()
    assert user.element_count == 0 and workspace.can_redo


@pytest.mark.parametrize(
    "call, error",
    [
        (lambda ws: ws.checkout("absent"), kiv.CannotCheckout),
        (lambda ws: ws.merge("absent"), kiv.Error),
        (lambda ws: ws.synchronous_push(), kiv.NoOrigin),
        (lambda ws: ws.push("sideways"), ValueError),
        (lambda ws: ws.merge("master", strategy="octopus"), ValueError),
    ],
)
def test_bad_requests_raise_and_change_nothing(cards, repository, call, error):
    repo, workspace, user = repository
    workspace.commit_transaction(lambda: user.create(cards["Card"]))
    document, tip = user.to_json(), repo.head.tip
    with pytest.raises(error):
        call(workspace)
    assert user.to_json() == document and repo.head.tip == tip and repo.head.name == "master"


def test_a_notice_on_the_pushing_thread_reaches_a_python_callable(cards):
    repositories = kiv.Model()
    origin = kiv.LocalRepository.create(repositories, kiv.Model())
    origin.init(bare=True)
    ann_user, bob_user = kiv.Model(), kiv.Model()
    ann = origin.clone()
    bob = origin.clone()
    ann_ws, bob_ws = ann.workspace(ann_user), bob.workspace(bob_user)
    notices = queue.Queue()
    bob.start_observing_origin(lambda pull: notices.put(pull))
    try:
        ann_ws.commit_transaction(lambda: ann_user.create(cards["Card"]).set("title", "from ann"))
        ann_ws.push().result()
        pull = notices.get(timeout=30)
        pull()
        bob_ws.update_context()
        assert [c.title for c in bob_user.elements] == ["from ann"]
    finally:
        bob.stop_observing_origin()


def test_clone_push_and_pull_through_kiv_serve(cards, server):
    ann_user, bob_user = kiv.Model(), kiv.Model()
    ann = kiv.clone_from(server.url, kiv.Model())
    bob = kiv.clone_from(server.url, kiv.Model())
    ann_ws, bob_ws = ann.workspace(ann_user), bob.workspace(bob_user)
    ann_ws.commit_transaction(lambda: ann_user.create(cards["Card"]).set("title", "networked"))
    ann_ws.synchronous_push("try")
    assert bob_ws.pull().wait(timeout=30)
    bob_ws.update_context()
    assert [c.title for c in bob_user.elements] == ["networked"]
    with pytest.raises(ValueError):
        kiv.clone_from("http://nowhere", kiv.Model())


@pytest.mark.parametrize(
    "strategy, tool, points, tags",
    [
        ("recursive", "accept-theirs", 1, {"side"}),   # theirs wins whole: ours' points lost
        ("three-way", "accept-theirs", 1, {"side"}),
        ("recursive", "property", 7, {"side"}),         # both edits kept
        ("three-way", "property", 7, {"side"}),
        ("accept-theirs", "accept-theirs", 1, {"side"}),
    ],
)
def test_the_chosen_strategy_and_tool_decide_the_merge(cards, repository, strategy, tool, points, tags):
    repo, workspace, user = repository

    def make():
        card = user.create(cards["Card"])
        card.title, card.points = "one", 1

    workspace.commit_transaction(make)
    workspace.branch("side")
    workspace.checkout("side")
    workspace.commit_transaction(lambda: next(iter(user.elements)).tags.add("side"))
    workspace.checkout("master")
    workspace.commit_transaction(lambda: next(iter(user.elements)).set("points", 7))
    assert workspace.merge("side", strategy=strategy, tool=tool) == []
    card = next(iter(user.elements))
    assert (card.points, set(card.tags)) == (points, tags)
    assert repo.head.tip.is_merge == (strategy != "accept-theirs") or repo.head.tip.parents

"""The main story in Python: a metamodel made at run time, edits that become commits,
undo and redo, a branch merged property by property, and two members who clone from a
kiv-serve, push and pull over the network.

Run it with tools/run-example python (it starts a kiv-serve of the build), or by hand:
    PYTHONPATH=build/default/python python3 examples/python/team_board.py build/default/kiv-serve/kiv-serve
"""

import re
import subprocess
import sys
import threading

import kiv


def define_board():
    mm = kiv.Metamodel("board", "/examples/python/board")
    card = mm.add_class("Card")
    card.add_property("title", "String")
    card.add_property("points", "Integer")
    card.add_property("tags", "String", kind="set")
    return mm.register()


def show(heading, user):
    print(heading)
    for card in sorted(user.elements, key=lambda c: c.title):
        tags = " ".join(f"#{t}" for t in sorted(card.tags))
        print(f"  {card.title} ({card.points} points) {tags}".rstrip())


def alone(board):
    print("== One member: edits, undo, redo, a branch and a merge")
    repositories, user = kiv.Model(), kiv.Model()
    repository = kiv.LocalRepository.create(repositories, user)
    repository.init()
    workspace = repository.workspace(user)

    def first_cards():
        for title, points in (("Login page", 3), ("Search", 5)):
            card = user.create(board["Card"])
            card.title, card.points = title, points

    workspace.commit_transaction(first_cards)
    login = next(c for c in user.elements if c.title == "Login page")
    workspace.commit_transaction(lambda: setattr(login, "points", 8))
    show("after two commits:", user)
    workspace.undo()
    show("after undo:", user)
    workspace.redo()

    workspace.branch("polish")
    workspace.checkout("polish")
    workspace.commit_transaction(lambda: login.tags.add("ux"))
    workspace.checkout("master")
    login = next(c for c in user.elements if c.title == "Login page")
    workspace.commit_transaction(lambda: setattr(login, "title", "Sign-in page"))
    conflicts = workspace.merge("polish", tool="property")
    show("master merged with polish, property by property (both edits kept):", user)
    print(f"  conflicts: {len(conflicts)}; head {repository.head.name} at a merge: {repository.head.tip.is_merge}")
    try:
        workspace.checkout("nowhere")
    except kiv.CannotCheckout as refused:
        print(f"  refused: {refused.catalog}/{refused.key}")


def start_server(program):
    server = subprocess.Popen([program, "--port", "0"], stdout=subprocess.PIPE, text=True)
    line = [""]
    reader = threading.Thread(target=lambda: line.__setitem__(0, server.stdout.readline()), daemon=True)
    reader.start()
    reader.join(10)
    match = re.search(r"ws://[^/\s]+:\d+/", line[0])
    if not match:
        server.kill()
        raise SystemExit(f"kiv-serve did not start: {line[0]!r}")
    return server, match.group(0)


def over_the_network(board, program):
    print("\n== Two members and a kiv-serve")
    server, url = start_server(program)
    try:
        print(f"kiv-serve listens on {url}")
        ann_user, bob_user = kiv.Model(), kiv.Model()
        ann = kiv.clone_from(url, kiv.Model())
        bob = kiv.clone_from(url, kiv.Model())
        bob.set_merge_strategy(tool="property")  # when both change one card, both changes stay
        ann_ws, bob_ws = ann.workspace(ann_user), bob.workspace(bob_user)
        ann_ws.commit_transaction(lambda: ann_user.create(board["Card"]).set("title", "Export"))
        ann_ws.synchronous_push("try")
        print("ann pushes a card")
        bob_ws.synchronous_pull()
        bob_ws.update_context()
        show("bob pulls:", bob_user)
        bob_ws.commit_transaction(lambda: next(iter(bob_user.elements)).set("points", 2))
        ann_ws.commit_transaction(lambda: next(iter(ann_user.elements)).tags.add("csv"))
        ann_ws.synchronous_push("try")
        try:
            bob_ws.synchronous_push("try")
        except kiv.CannotPush:
            print("bob's plain push is refused: the server moved on")
        bob_ws.synchronous_push("merge-first")
        bob_ws.update_context()
        show("bob merges first, property by property, and pushes:", bob_user)
        ann_ws.synchronous_pull()
        ann_ws.update_context()
        show("ann pulls:", ann_user)
    finally:
        server.terminate()
        server.wait(10)


def main():
    board = define_board()
    alone(board)
    if len(sys.argv) > 1:
        over_the_network(board, sys.argv[1])


if __name__ == "__main__":
    main()

"""What the Python module costs over the C++ API, in one run:

  - a user transaction that changes 10 cards of 1,000 through commit_transaction, against
    the C++ userCommit/k:10/N:1000 of workspace_bench;
  - reading one Integer property of 10,000 cards, against readTenThousandValues.

Usage (after a default build):
  PYTHONPATH=build/default/python python3 bench/python/binding_bench.py build/default/bench/workspace_bench
"""

import json
import statistics
import subprocess
import sys
import timeit

import kiv


def card_metamodel():
    mm = kiv.Metamodel("pb", "/bench/python")
    card = mm.add_class("Card")
    for name in ("name", "title", "note"):
        card.add_property(name, "String")
    card.add_property("count", "Integer")
    card.add_property("weight", "Integer")
    return mm.register()


def make_workspace(mm, n):
    repositories, user = kiv.Model(), kiv.Model()
    repository = kiv.LocalRepository.create(repositories, user)
    repository.init()
    workspace = repository.workspace(user)
    cards = []

    def fill():
        for i in range(n):
            card = user.create(mm["Card"])
            card.name = f"card {i}"
            card.title = f"The title of the card numbered {i}"
            card.note = f"A note long enough to make the entry about as large as a typical element: {i}"
            card.count = i
            cards.append(card)

    workspace.commit_transaction(fill)
    return workspace, cards


def median_seconds(call, number, repeat=5):
    return statistics.median(timeit.repeat(call, number=number, repeat=repeat)) / number


def cpp_figures(program):
    out = subprocess.run([program, "--benchmark_filter=userCommit/k:10/N:1000$|readTenThousandValues",
                          "--benchmark_format=json", "--benchmark_repetitions=5",
                          "--benchmark_report_aggregates_only=true"],
                         capture_output=True, text=True, check=True).stdout
    figures = {}
    for entry in json.loads(out)["benchmarks"]:
        if entry.get("aggregate_name") == "median":
            scale = {"us": 1e-6, "ns": 1e-9, "ms": 1e-3}[entry["time_unit"]]
            figures[entry["run_name"]] = entry["real_time"] * scale
    return figures


def main():
    mm = card_metamodel()
    workspace, cards = make_workspace(mm, 1000)
    state = {"next": 0}

    def commit_ten():
        def edit():
            for _ in range(10):
                state["next"] += 1
                cards[state["next"] % len(cards)].weight = state["next"]
        workspace.commit_transaction(edit)

    commit = median_seconds(commit_ten, 200)
    _, many = make_workspace(mm, 10000)
    read = median_seconds(lambda: sum(card.count for card in many), 5)
    print(f"python commit_transaction of 10 cards in 1,000: {commit * 1e6:9.1f} us")
    print(f"python read of 10,000 Integer values:            {read * 1e6:9.1f} us")
    if len(sys.argv) > 1:
        cpp = cpp_figures(sys.argv[1])
        cpp_commit = cpp["userCommit/k:10/N:1000"]
        cpp_read = cpp["readTenThousandValues"]
        print(f"C++ userCommit/k:10/N:1000:                      {cpp_commit * 1e6:9.1f} us  (python {commit / cpp_commit:.2f}x)")
        print(f"C++ readTenThousandValues:                       {cpp_read * 1e6:9.1f} us  (python {read / cpp_read:.1f}x)")


if __name__ == "__main__":
    main()

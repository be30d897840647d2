// The version-control API: repositories, the workspace, branches, commits and deltas,
// merges with a choice of strategy and tool, push and pull, clones over the network and
// change notices delivered to Python callables.
#include "binding.h"
#include "kiv/kiv.h"
#include "qf/zero/core/text.h"
#include "qf/zero/io/websocket_channel.h"
#include "values.h"

#include <nlohmann/json.hpp>

#include <pybind11/functional.h>
#include <pybind11/stl.h>

#include <chrono>
#include <future>
#include <memory>
#include <regex>
#include <string>
#include <vector>

namespace py = pybind11;
using qf::zero::Model;
using qf::zero::toUtf16;
using qf::zero::toUtf8;

namespace kiv::python {

namespace {

// A push or pull under way on its worker thread.
class Pending {
 public:
  explicit Pending(std::future<void> future) : future_(future.share()) {}

  // Waits (without the GIL) at most `timeout` seconds, or for good; true when done.
  bool wait(std::optional<double> timeout) const {
    py::gil_scoped_release released;
    if (!timeout) {
      future_.wait();
      return true;
    }
    return future_.wait_for(std::chrono::duration<double>(*timeout)) == std::future_status::ready;
  }
  // Waits, then raises what the operation raised.
  void result() const {
    {
      py::gil_scoped_release released;
      future_.wait();
    }
    future_.get();
  }
  bool done() const { return future_.wait_for(std::chrono::seconds(0)) == std::future_status::ready; }

 private:
  std::shared_future<void> future_;
};

// Hands each change notice of the origin to a Python callable, on the notifier's thread
// with the GIL taken: `repository_modified(pull)`, where calling `pull()` pulls (without
// the GIL). The callable should return soon; it may keep `pull` to call later, from any
// thread.
class PythonNoticeExecutor final : public NoticeExecutor {
 public:
  explicit PythonNoticeExecutor(py::object callable) : callable_(new py::object(std::move(callable))) {}
  ~PythonNoticeExecutor() override {
    if (!Py_IsInitialized()) return;  // the interpreter is gone: leave the object be
    py::gil_scoped_acquire taken;
    delete callable_;
  }

  void post(std::function<void()> work) override {
    if (!Py_IsInitialized()) return;
    py::gil_scoped_acquire taken;
    const auto shared = std::make_shared<std::function<void()>>(std::move(work));
    const py::cpp_function pull([shared] {
      py::gil_scoped_release released;
      (*shared)();
    });
    try {
      (*callable_)(pull);
    } catch (py::error_already_set& error) {
      error.discard_as_unraisable("kiv: repository_modified");
    }
  }

 private:
  py::object* callable_;
};

PushMode pushModeNamed(const std::string& mode) {
  if (mode == "try") return PushMode::TryPush;
  if (mode == "merge-first") return PushMode::MergeFirst;
  throw py::value_error("a push mode is 'try' or 'merge-first', not '" + mode + "'");
}

RepoType repoType(bool bare) { return bare ? RepoType::Bare : RepoType::Regular; }

std::unique_ptr<IMergeTool> toolNamed(const std::string& tool, const std::string& policy,
                                      PropertyMergeTool** propertyTool) {
  if (tool == "accept-theirs") return std::make_unique<AcceptTheirsMergeTool>();
  if (tool == "property") {
    ConflictPolicy chosen = ConflictPolicy::PreferTheirs;
    if (policy == "prefer-ours") {
      chosen = ConflictPolicy::PreferOurs;
    } else if (policy != "prefer-theirs") {
      throw py::value_error("a conflict policy is 'prefer-theirs' or 'prefer-ours', not '" + policy + "'");
    }
    auto made = std::make_unique<PropertyMergeTool>(chosen);
    *propertyTool = made.get();
    return made;
  }
  throw py::value_error("a merge tool is 'accept-theirs' or 'property', not '" + tool + "'");
}

std::shared_ptr<IMergeStrategy> strategyNamed(const std::string& strategy, std::unique_ptr<IMergeTool> tool) {
  if (strategy == "recursive") return std::make_shared<RecursiveMerge3Strategy>(std::move(tool));
  if (strategy == "three-way") return std::make_shared<Merge3Strategy>(std::move(tool));
  if (strategy == "accept-theirs") return std::make_shared<AcceptTheirsMergeStrategy>();
  throw py::value_error("a merge strategy is 'recursive', 'three-way' or 'accept-theirs', not '" + strategy +
                        "'");
}

py::dict conflictToPython(const MergeConflict& conflict) {
  py::dict entry;
  entry["element"] = uuidToPython(conflict.element);
  entry["type"] = conflict.type;
  entry["property"] = conflict.property;
  entry["kind"] = std::string(toString(conflict.kind));
  entry["base"] = jsonToPython(conflict.base);
  entry["ours"] = jsonToPython(conflict.ours);
  entry["theirs"] = jsonToPython(conflict.theirs);
  entry["merged"] = jsonToPython(conflict.merged);
  return entry;
}

void withTransaction(const Model& model, const std::function<void()>& change) {
  qf::zero::Transaction transaction = model->beginTransaction();
  change();
  transaction.commit();
}

// Merges `source` into the head with the strategy and tool asked for, which stay the
// repository's strategy only for this merge. The property tool's conflicts are returned.
py::list mergeInto(const Workspace& workspace, const std::string& source, const std::string& strategy,
                   const std::string& tool, const std::string& policy) {
  PropertyMergeTool* propertyTool = nullptr;
  const std::shared_ptr<IMergeStrategy> chosen =
      strategyNamed(strategy, toolNamed(tool, policy, &propertyTool));
  const LocalRepository repository = workspace->getRepository();
  const Model repositories = repository.getModel();
  const std::shared_ptr<IMergeStrategy> before = repository->getIMergeStrategy();
  withTransaction(repositories, [&] { repository->setIMergeStrategy(chosen); });
  try {
    workspace->merge(toUtf16(source));
  } catch (...) {
    withTransaction(repositories, [&] { repository->setIMergeStrategy(before); });
    throw;
  }
  withTransaction(repositories, [&] { repository->setIMergeStrategy(before); });
  py::list conflicts;
  if (propertyTool != nullptr) {
    for (const MergeConflict& conflict : propertyTool->conflicts())
      conflicts.append(conflictToPython(conflict));
  }
  return conflicts;
}

// "ws://host:port/" or "ws://host:port/token".
LocalRepository cloneFrom(const std::string& url, const Model& repositories, bool bare) {
  static const std::regex pattern(R"(ws://([^:/]+):([0-9]{1,5})(/.*)?)");
  std::smatch parts;
  if (!std::regex_match(url, parts, pattern))
    throw py::value_error("not a kiv-serve URL (ws://HOST:PORT/): " + url);
  const int port = std::stoi(parts[2].str());
  if (port <= 0 || port > 65535) throw py::value_error("not a port: " + parts[2].str());
  const std::string target = parts[3].matched && !parts[3].str().empty() ? parts[3].str() : "/";
  RemoteRepository server;
  withTransaction(repositories, [&] { server = RemoteRepository::create(repositories); });
  server->setSynchronizationChannel(
      qf::zero::io::WebSocketChannel::connect(parts[1].str(), static_cast<std::uint16_t>(port), target));
  return server->synchronousClone(repoType(bare));
}

// Push and pull, asynchronous and synchronous, as a workspace and a local repository both
// offer them; the synchronous forms wait without the GIL.
template <class Class>
void bindPushAndPull(Class& bound) {
  using Handle = typename Class::type;
  bound
      .def(
          "push",
          [](const Handle& h, const std::string& mode) { return Pending(h->push(pushModeNamed(mode))); },
          py::arg("mode") = "try")
      .def("pull", [](const Handle& h) { return Pending(h->pull()); })
      .def(
          "synchronous_push",
          [](const Handle& h, const std::string& mode) {
            const PushMode chosen = pushModeNamed(mode);
            py::gil_scoped_release released;
            h->synchronousPush(chosen);
          },
          py::arg("mode") = "try")
      .def("synchronous_pull", [](const Handle& h) {
        py::gil_scoped_release released;
        h->synchronousPull();
      });
}

py::dict branchesOf(const Repository& repository) {
  py::dict branches;
  for (const Branch& branch : repository->getBranches().getTypedValues())
    branches[py::str(toUtf8(branch->getName()))] = branch;
  return branches;
}

}  // namespace

void bindVersionControl(py::module_& module) {
  py::class_<Pending>(module, "Pending", "A push or pull under way.")
      .def("wait", &Pending::wait, py::arg("timeout") = std::nullopt)
      .def("result", &Pending::result)
      .def_property_readonly("done", &Pending::done);

  py::class_<Delta, qf::zero::ModelElement, ElementHolder<Delta>>(module, "Delta")
      .def_property_readonly("is_empty", [](const Delta& d) { return d->isEmpty(); })
      .def_property_readonly("is_snapshot", [](const Delta& d) { return d->getIsSnapshot(); })
      .def(
          "to_change_report", [](const Delta& d) { return jsonToPython(d->toChangeReport()); },
          "The change as a change-report document.");

  py::class_<Commit, qf::zero::ModelElement, ElementHolder<Commit>>(module, "Commit")
      .def_property_readonly("parents", [](const Commit& c) { return c->getParents().getTypedValues(); })
      .def_property_readonly("is_initial", [](const Commit& c) { return c->isInitial(); })
      .def_property_readonly("is_merge", [](const Commit& c) { return c->isMerge(); })
      .def_property_readonly("delta",
                             [](const Commit& c) -> py::object {
                               const Delta delta = c->getDelta();
                               return delta ? py::cast(delta) : py::none();
                             })
      .def("is_predecessor_of",
           [](const Commit& c, const Commit& other) { return c->isPredecessorOf(other); })
      .def(
          "snapshot",
          [](const Commit& c) {
            py::object report;
            withTransaction(c.getModel(), [&] {
              Delta snapshot = c->getSnapshot();
              report = jsonToPython(snapshot->toChangeReport());
              snapshot.destroy();
            });
            return report;
          },
          "The state at this commit as a change report that creates it.")
      .def(
          "diff",
          [](const Commit& c, const Commit& predecessor) {
            py::object report;
            withTransaction(c.getModel(), [&] {
              Delta difference = c->diff(predecessor);
              report = jsonToPython(difference->toChangeReport());
            });
            return report;
          },
          "The change from the state at `predecessor` to the state here, as a change report.");

  py::class_<Branch, qf::zero::ModelElement, ElementHolder<Branch>>(module, "Branch")
      .def_property_readonly("name", [](const Branch& b) { return toUtf8(b->getName()); })
      .def_property_readonly("tip",
                             [](const Branch& b) -> py::object {
                               const Commit tip = b->getTip();
                               return tip ? py::cast(tip) : py::none();
                             })
      .def_property_readonly("is_empty", [](const Branch& b) { return b->isEmpty(); })
      .def_property_readonly("can_undo", [](const Branch& b) { return b->canUndo(); })
      .def_property_readonly("can_redo", [](const Branch& b) { return b->canRedo(); });

  py::class_<Workspace, qf::zero::ModelElement, ElementHolder<Workspace>> workspace(module, "Workspace");
  workspace
      .def(
          "commit_transaction",
          [](const Workspace& w, const py::function& edit) {
            w->commitTransaction(qf::zero::HxArray([edit](const std::vector<qf::zero::Value>&) {
              edit();
              return std::vector<qf::zero::Value>();
            }));
          },
          py::arg("edit"),
          "Runs `edit()` inside one transaction of the user model and commits it: one commit. An "
          "exception from `edit` cancels the transaction and propagates.")
      .def("undo", [](const Workspace& w) { w->undo(); })
      .def("redo", [](const Workspace& w) { w->redo(); })
      .def_property_readonly("can_undo", [](const Workspace& w) { return w->canUndo(); })
      .def_property_readonly("can_redo", [](const Workspace& w) { return w->canRedo(); })
      .def_property_readonly("can_commit", [](const Workspace& w) { return w->canCommit(); })
      .def("can_checkout",
           [](const Workspace& w, const std::string& name) { return w->canCheckout(toUtf16(name)); })
      .def("branch", [](const Workspace& w, const std::string& name) { w->branch(toUtf16(name)); })
      .def("checkout", [](const Workspace& w, const std::string& name) { w->checkout(toUtf16(name)); })
      .def("merge", &mergeInto, py::arg("source"), py::arg("strategy") = "recursive",
           py::arg("tool") = "accept-theirs", py::arg("policy") = "prefer-theirs",
           "Merges branch `source` into the head; returns the property tool's conflicts (empty for "
           "the accept-theirs tool).")
      .def("update_context", [](const Workspace& w) { w->updateContext(); })
      .def_property_readonly("context", [](const Workspace& w) -> py::object {
        const Commit context = w->getContext();
        return context ? py::cast(context) : py::none();
      });
  bindPushAndPull(workspace);

  py::class_<Repository, qf::zero::ModelElement, ElementHolder<Repository>>(module, "Repository")
      .def_property_readonly("head",
                             [](const Repository& r) -> py::object {
                               const Branch head = r->getHead();
                               return head ? py::cast(head) : py::none();
                             })
      .def_property_readonly("branches", &branchesOf)
      .def_property_readonly("is_bare", [](const Repository& r) { return r->getIsBare(); })
      .def_property_readonly("is_empty", [](const Repository& r) { return r->isEmpty(); });

  py::class_<LocalRepository, Repository, ElementHolder<LocalRepository>> localRepository(module,
                                                                                          "LocalRepository");
  localRepository
      .def_static(
          "create",
          [](const Model& repositories, const Model& user) {
            return LocalRepository::create(repositories, user);
          },
          py::arg("repositories"), py::arg("user"),
          "A repository kept in `repositories` over the user model `user`; call init() or clone.")
      .def(
          "init", [](const LocalRepository& r, bool bare) { r->init(repoType(bare)); },
          py::arg("bare") = false)
      .def(
          "set_merge_strategy",
          [](const LocalRepository& r, const std::string& strategy, const std::string& tool,
             const std::string& policy) {
            PropertyMergeTool* ignored = nullptr;
            const std::shared_ptr<IMergeStrategy> chosen =
                strategyNamed(strategy, toolNamed(tool, policy, &ignored));
            withTransaction(r.getModel(), [&] { r->setIMergeStrategy(chosen); });
          },
          py::arg("strategy") = "recursive", py::arg("tool") = "accept-theirs",
          py::arg("policy") = "prefer-theirs",
          "The strategy this repository merges with: by the workspace's merge when none is named, and by "
          "a push that merges first.")
      .def(
          "workspace", [](const LocalRepository& r, const Model& user) { return r->getWorkspace(user); },
          py::arg("user"))
      .def("checkout", [](const LocalRepository& r, const std::string& name) { r->checkout(toUtf16(name)); })
      .def(
          "clone",
          [](const LocalRepository& r, bool bare) {
            py::gil_scoped_release released;
            return LocalRepository::clone(r, repoType(bare));
          },
          py::arg("bare") = false, "A clone of this repository in the same process, with this one as origin.")

      .def(
          "start_observing_origin",
          [](const LocalRepository& r, const std::optional<py::object>& repositoryModified) {
            if (repositoryModified)
              setNoticeExecutor(r, std::make_shared<PythonNoticeExecutor>(*repositoryModified));
            py::gil_scoped_release released;
            r->startObservingOrigin();
          },
          py::arg("repository_modified") = std::nullopt,
          "Observes the origin. With `repository_modified`, each change notice calls it with a "
          "`pull` callable (on the notifier's thread, GIL taken) instead of pulling at once.")
      .def("stop_observing_origin", [](const LocalRepository& r) {
        py::gil_scoped_release released;
        r->stopObservingOrigin();
      });
  bindPushAndPull(localRepository);

  module.def("clone_from", &cloneFrom, py::arg("url"), py::arg("repositories"), py::arg("bare") = false,
             py::call_guard<py::gil_scoped_release>(),
             "Clones the repository a kiv-serve serves at `url` (ws://HOST:PORT/ or with a token path) "
             "into `repositories`.");
}

}  // namespace kiv::python

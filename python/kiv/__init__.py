"""kiv: version control for in-memory object models.

A user model is a graph of elements described by a metamodel. A local repository over
it records every committed transaction as a commit on the current branch, undoes and
redoes, branches, merges, and pushes to and pulls from other repositories, in the same
process or from a kiv-serve over the network.

    import kiv
    mm = kiv.Metamodel("notes", "/example/notes/1")
    note = mm.add_class("Note"); note.add_property("text", "String"); mm.register()

    repositories, user = kiv.Model(), kiv.Model()
    repository = kiv.LocalRepository.create(repositories, user)
    repository.init()
    workspace = repository.workspace(user)
    workspace.commit_transaction(lambda: user.create(mm["Note"]).set("text", "hello"))
    workspace.undo()

Names follow PEP 8: the C++ lowerCamel operations are snake_case here
(``commitTransaction`` is ``commit_transaction``), classes keep their C++ names, and
each catalog error is a class named after its key, deriving from :class:`kiv.Error`.
"""

from . import _kiv
from ._kiv import (  # noqa: F401
    Branch,
    Collection,
    Commit,
    Delta,
    Element,
    LocalRepository,
    MetaClass,
    MetaEnum,
    MetaProperty,
    Model,
    Pending,
    Repository,
    Transaction,
    Workspace,
    clone_from,
    meta_class,
)
from .errors import Error  # noqa: F401
from .metamodel import ClassBuilder, Metamodel  # noqa: F401

globals().update({name: cls for name, cls in errors._define_all().items() if name not in globals()})

__all__ = [name for name in globals() if not name.startswith("_")]

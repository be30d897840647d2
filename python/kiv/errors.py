"""Errors of kiv and of the framework under it, one class per message of their catalogs.

Every class derives from :class:`Error`. An error carries ``catalog`` (the catalog's
name, e.g. ``"kiv:messages"``), ``key`` (the message's key, which is also its class
name) and ``args`` (the message's arguments); ``str(error)`` is the rendered text.
A key found in both catalogs is one class; ``catalog`` tells which raised it.
"""

from . import _kiv


class Error(Exception):
    """A catalog error of kiv or of its framework."""

    catalog: str = ""
    key: str = ""

    def __init__(self, *args, message: str = "", catalog: str = ""):
        super().__init__(*args)
        self.message = message
        if catalog:
            self.catalog = catalog

    def __str__(self) -> str:
        return self.message or f"{self.catalog}/{self.key}"


_classes: dict = {}


def _class_for(key: str) -> type:
    found = _classes.get(key)
    if found is None:
        found = type(key, (Error,), {"key": key, "__module__": "kiv", "__doc__": f"The catalog error {key!r}."})
        _classes[key] = found
    return found


def _make(catalog: str, key: str, args: tuple, message: str) -> Error:
    return _class_for(key)(*args, message=message, catalog=catalog)


def _define_all() -> dict:
    for catalog, keys in _kiv._catalogs().items():
        for key in keys:
            _class_for(key)
    return dict(_classes)


_kiv._set_error_factory(_make)

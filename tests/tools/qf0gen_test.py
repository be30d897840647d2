"""The metamodel generator: descriptions it must refuse, naming the offending item, and
the facts of a well-formed description's output that builds and stored models rely on."""

import contextlib
import copy
import io
import json
import os
import runpy
import sys
import tempfile
import unittest
import uuid

GENERATOR = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "..", "tools", "qf0gen")
sys.path.insert(0, GENERATOR)

from qf0gen import emit_package  # noqa: E402
from qf0gen.description import Description, DescriptionError  # noqa: E402

# The command line, qf0gen.py, shares its name with the package beside it, so it is
# run from its path rather than imported.
generator_main = runpy.run_path(os.path.join(GENERATOR, "qf0gen.py"))["main"]

URI = "/test/shop/1"

BASE = {
    "metaPackage": {"class": "MetaPackageShop", "namespace": "shop", "includeDir": "shop"},
    "packages": [{"name": "shop", "uri": URI}],
    "enums": [{"name": "Size", "literals": [["Small", 0], ["Large", 1]]}],
    "classes": [
        {"name": "Item", "abstract": True, "doc": ["Something the shop sells.", "", "  Item::Builder ..."],
         "properties": [{"name": "name", "type": "String"},
                        {"name": "price", "type": "Integer", "doc": "In cents; never negative."},
                        {"name": "size", "kind": "optional", "type": "Size"}],
         "operations": [{"name": "label", "result": "String", "const": True, "abstract": True,
                         "doc": ["What the tag says.", "Raises \"NotImplemented\" for a bare item."]},
                        {"name": "scale", "args": [{"name": "by", "type": "Integer"}]},
                        {"name": "scale", "args": [{"name": "to", "type": "Size"}]}]},
        {"name": "Shirt", "super": "Item", "overrides": ["label"],
         "properties": [{"name": "colours", "kind": "set", "type": "String"},
                        {"name": "shop", "kind": "optional", "type": "Shop", "opposite": "items"}]},
        {"name": "Shop",
         "properties": [{"name": "items", "kind": "map", "type": "Shirt", "composite": True, "key": "name",
                         "opposite": "shop"}]},
    ],
}


def described(change=None):
    data = copy.deepcopy(BASE)
    if change:
        change(data)
    return data


def cli(*args):
    """Runs the command line; returns its exit code, output and error output."""
    out, err = io.StringIO(), io.StringIO()
    with contextlib.redirect_stdout(out), contextlib.redirect_stderr(err):
        code = generator_main(list(args))
    return code, out.getvalue(), err.getvalue()


def written(directory, data):
    path = os.path.join(directory, "shop.json")
    with open(path, "w", encoding="utf-8") as f:
        json.dump(data, f)
    return path


def cls(data, name):
    return next(c for c in data["classes"] if c["name"] == name)


def prop(data, owner, name):
    return next(p for p in cls(data, owner)["properties"] if p["name"] == name)


class RefusedDescriptions(unittest.TestCase):
    def assertRefused(self, change, *fragments):
        with self.assertRaises(DescriptionError) as caught:
            Description(described(change), "shop.json")
        for fragment in fragments:
            self.assertIn(fragment, str(caught.exception))

    def test_unknown_names(self):
        self.assertRefused(lambda d: prop(d, "Item", "price").update(type="Integr"),
                           "class Item, property price", "unknown type 'Integr'")
        self.assertRefused(lambda d: cls(d, "Shirt").update(super="Itme"), "class Shirt", "unknown superclass 'Itme'")
        self.assertRefused(lambda d: cls(d, "Shop").update(propertes=[]), "class Shop", "unknown field(s) propertes")
        self.assertRefused(lambda d: prop(d, "Item", "name").update(readonly=True),
                           "class Item, property name", "unknown field(s) readonly")
        self.assertRefused(lambda d: d["enums"].append({"name": "String", "literals": [["A", 0]]}),
                           "enumeration String", "the type name 'String' is taken")
        self.assertRefused(lambda d: cls(d, "Item").update(super="Shirt"), "class Item", "superclass chain is a cycle")
        self.assertRefused(lambda d: cls(d, "Shop").pop("name"), "class 3: needs a name")
        self.assertRefused(lambda d: d["metaPackage"].pop("includeDir"), "metaPackage: needs 'includeDir'")

    def test_documentation_is_text(self):
        self.assertRefused(lambda d: prop(d, "Item", "name").update(doc=3),
                           "class Item, property name", "doc is a string or a list of strings")
        self.assertRefused(lambda d: cls(d, "Shop").update(doc=["one", 2]), "class Shop", "doc is a string")

    def test_only_a_single_json_value_is_held_as_text(self):
        self.assertRefused(lambda d: prop(d, "Item", "name").update(heldAsText=True),
                           "class Item, property name", "heldAsText is true or false")
        self.assertRefused(lambda d: prop(d, "Item", "name").update(type="JsonValue", kind="sequence", heldAsText=True),
                           "class Item, property name", "only for a single JsonValue")
        self.assertRefused(lambda d: prop(d, "Item", "name").update(type="JsonValue", heldAsText="yes"),
                           "class Item, property name", "heldAsText is true or false")

    def test_indexes_continue_after_the_superclass(self):
        self.assertRefused(lambda d: prop(d, "Item", "price").update(index=3),
                           "class Item, property price", "index 3, expected 2")
        self.assertRefused(lambda d: prop(d, "Shirt", "colours").update(index=1),
                           "class Shirt, property colours", "index 1, expected 4")

    def test_maps_and_keys(self):
        self.assertRefused(lambda d: prop(d, "Shop", "items").pop("key"), "class Shop, property items", "key")
        self.assertRefused(lambda d: prop(d, "Shirt", "colours").update(key="name"),
                           "class Shirt, property colours", "only a map has one")
        self.assertRefused(lambda d: prop(d, "Shop", "items").update(key="colours"),
                           "class Shop, property items", "no single-valued attribute 'colours'")
        self.assertRefused(lambda d: prop(d, "Item", "name").update(kind="map", key="name"),
                           "class Item, property name", "a map holds elements of a class")

    def test_opposites_name_each_other(self):
        self.assertRefused(lambda d: prop(d, "Shirt", "shop").pop("opposite"),
                           "class Shop, property items", "Shirt.shop must name this property back")
        self.assertRefused(lambda d: prop(d, "Shop", "items").update(opposite="owner"),
                           "class Shop, property items", "Shirt has no property 'owner'")
        self.assertRefused(lambda d: prop(d, "Item", "name").update(opposite="shop"),
                           "class Item, property name", "only a reference has an opposite")

    def test_operations(self):
        self.assertRefused(lambda d: cls(d, "Shirt").pop("overrides"),
                           "class Shirt", "must override the abstract operation 'label'")
        self.assertRefused(lambda d: cls(d, "Shirt").update(overrides=["label", "scale"]),
                           "class Shirt", "overrides 'scale', which no superclass declares virtual")
        self.assertRefused(lambda d: cls(d, "Item")["operations"][2]["args"][0].update(type="Integer"),
                           "class Item", "two operations scale(Integer)")
        self.assertRefused(lambda d: cls(d, "Item")["operations"][1].update(static=True, const=True),
                           "class Item, operation scale", "neither const nor virtual")
        self.assertRefused(lambda d: cls(d, "Item")["operations"][1]["args"][0].update(direction="inout"),
                           "class Item, operation scale, argument 1", "direction")

    def test_the_command_line_reports_and_writes_nothing(self):
        with tempfile.TemporaryDirectory() as tmp:
            path = written(tmp, described(lambda d: prop(d, "Item", "price").update(type="Money")))
            code, _, err = cli(path, "--out", os.path.join(tmp, "out"))
            self.assertEqual(code, 1)
            self.assertIn("class Item, property price: unknown type 'Money'", err)
            self.assertFalse(os.path.exists(os.path.join(tmp, "out")))


class GeneratedOutput(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.tmp = tempfile.TemporaryDirectory()
        cls.path = written(cls.tmp.name, described())
        cls.out = os.path.join(cls.tmp.name, "out")
        assert cli(cls.path, "--out", cls.out)[0] == 0

    @classmethod
    def tearDownClass(cls):
        cls.tmp.cleanup()

    def text(self, relative):
        with open(os.path.join(self.out, relative), encoding="utf-8") as f:
            return f.read()

    def test_list_names_exactly_the_files_written(self):
        listed = sorted(cli(self.path, "--list")[1].split())
        files = sorted(os.path.relpath(os.path.join(root, f), self.out).replace(os.sep, "/")
                       for root, _, names in os.walk(self.out) for f in names)
        self.assertEqual(listed, files)
        for expected in ("include/shop/fwd.h", "include/shop/meta_package_shop.h", "include/shop/size.h",
                         "include/shop/shirt_impl.h", "src/shirt_access.cpp", "src/shirt_reflection.cpp",
                         "src/meta_package_shop_invokers.cpp"):
            self.assertIn(expected, listed)

    def test_item_uuids_are_name_based_on_the_root_uri(self):
        namespace = uuid.uuid3(uuid.UUID(int=0), URI)
        source = self.text("src/meta_package_shop.cpp")
        for key in (URI, "shop.Shirt", "shop.Shirt.colours", "shop.Size.Large", "shop.Item.scale(Integer)",
                    "shop.Item.scale(Size)", "shop.Item.scale(Size).to"):
            self.assertIn(f'"{uuid.uuid3(namespace, key)}"', source, key)

    def test_indexes_overloads_and_keys(self):
        source = self.text("src/meta_package_shop.cpp")
        self.assertIn("setPropertyIndex(Shirt_colours_, 4);", source)
        self.assertIn("setPropertyIndex(Shirt_shop_, 5);", source)
        self.assertIn("Shop_items_->setQualifiedBy(Item_name_);", source)
        self.assertIn("Size_->setUnderlyingType(frameworkInteger_);", source)
        without_integers = described(lambda d: d.update(classes=[{"name": "Tag", "properties": [
            {"name": "size", "type": "Size"}]}]))
        self.assertIn("Size_->setUnderlyingType(frameworkInteger_);",
                      emit_package.source(Description(without_integers, "shop.json")))
        header = self.text("include/shop/meta_package_shop.h")
        self.assertIn("getItem_scale_operation()", header)
        self.assertIn("getItem_scale_2_operation()", header)
        self.assertIn("std::map<std::u16string, ::shop::Shirt>", self.text("include/shop/shop_impl.h"))

    def test_a_rerun_leaves_unchanged_files_untouched(self):
        stamp = os.path.join(self.out, "include/shop/shirt.h")
        os.utime(stamp, (1, 1))
        self.assertEqual(cli(self.path, "--out", self.out)[0], 0)
        self.assertEqual(os.stat(stamp).st_mtime, 1)

    def test_documentation_stands_above_what_it_documents_in_the_handle(self):
        handle = self.text("include/shop/item.h")
        self.assertIn("// Something the shop sells.\n//\n//   Item::Builder ...\nclass Item ", handle)
        self.assertIn("  // In cents; never negative.\n  int getPrice() const;", handle)
        self.assertIn('  // What the tag says.\n  // Raises "NotImplemented" for a bare item.\n'
                      "  std::u16string label() const;", handle)
        self.assertNotIn("\n\n\n", handle)

    def test_what_users_must_not_touch_is_internal(self):
        impl = self.text("include/shop/item_impl.h")
        self.assertNotIn("class Item::Impl::Storage :", impl)
        self.assertIn("class Item::Impl::Storage :", self.text("include/shop/internal/item_storage.h"))
        self.assertIn('#include "shop/internal/item_storage.h"', self.text("include/shop/internal/shirt_storage.h"))
        public, raw = impl.split(" protected:")
        self.assertIn("void setPrice(int value);", public)
        self.assertNotIn("basicSet", public)
        self.assertIn("void basicSetPrice(int value);", raw.split(" private:")[0])

    def test_output_does_not_depend_on_where_the_description_lies(self):
        for root, _, names in os.walk(self.out):
            for name in names:
                with open(os.path.join(root, name), encoding="utf-8") as f:
                    self.assertNotIn(self.tmp.name, f.read(), name)
        self.assertTrue(self.text("include/shop/item.h").startswith("// Generated by qf0gen from shop.json."))

    def test_skeleton_defines_what_the_class_must_implement(self):
        shirt = cli(self.path, "--skeleton", "Shirt")[1]
        self.assertIn("std::u16string Shirt::Impl::label() const {", shirt)
        self.assertNotIn("scale", shirt, "inherited operations are defined once, by their class")
        item = cli(self.path, "--skeleton", "Item")[1]
        self.assertNotIn("label", item, "abstract operations have no definition")
        self.assertEqual(item.count("Item::Impl::scale("), 2)


if __name__ == "__main__":
    unittest.main()

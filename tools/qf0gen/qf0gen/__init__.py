"""qf0gen: generates the typed C++ element classes of a qf::zero metamodel from one
JSON description. See docs/metamodel-generator.md."""

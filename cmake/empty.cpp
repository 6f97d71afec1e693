// empty.cpp - gives the shared object a source of its own; its contents come from the library's objects.

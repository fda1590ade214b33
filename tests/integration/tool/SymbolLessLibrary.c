/* A library that loads but is no plug-in. */

__attribute__((visibility("default"))) const int something_else = 1;

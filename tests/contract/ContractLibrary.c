/* A library to load. */
__attribute__((visibility("default"))) const int wl_contract_number = 42;

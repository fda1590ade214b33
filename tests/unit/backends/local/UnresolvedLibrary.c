/* A library that needs a function which nobody has. */
extern int wl_defined_nowhere(void);

__attribute__((visibility("default"))) const int wl_contract_number = 42;

__attribute__((visibility("default"))) int wl_call(void);
int wl_call(void) {
    return wl_defined_nowhere();
}

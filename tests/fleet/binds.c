/*
 * Users that a directory's own means let in, many at once: what asking an account server is measured against. Each is
 * what ldapwhoami does, in one process: connect, StartTLS, sign in, and ask who that is.
 *
 *   fleet-binds ADDRESS AUTHORITY AT_ONCE [SEARCHER PASSWORD BASE] < PLAN
 *
 *   PLAN      a line for each user, with tabs between: seconds from the beginning, distinguished name, password. With a
 *             searcher, the name is the user's, and the entry below BASE is searched first
 *
 * A line is written for each, with tabs between: name, seconds from the beginning, seconds that it took, and the result's
 * code.
 */
#define _POSIX_C_SOURCE 200809L
#include <ldap.h>
#include <pthread.h>
#include <stdatomic.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>

enum { LONGEST_LINE = 1024, MOST_THREADS = 1024 };

struct visit {
    double at;
    char* name;
    char* password;
};

static struct visit* visits;
static size_t visit_count;
static atomic_size_t next_visit;
static double begin;
static const char *address, *authority, *searcher, *searcher_password, *base;

static double now(void) {
    struct timespec time;
    clock_gettime(CLOCK_MONOTONIC, &time);
    return (double)time.tv_sec + (double)time.tv_nsec / 1e9;
}

static int sign_in(LDAP* ldap, const char* name, char* password) {
    struct berval secret = {strlen(password), password};
    return ldap_sasl_bind_s(ldap, name, LDAP_SASL_SIMPLE, &secret, NULL, NULL, NULL);
}

static int prepare(LDAP* ldap) {
    const int version = LDAP_VERSION3, demand = LDAP_OPT_X_TLS_DEMAND, is_server = 0;
    ldap_set_option(ldap, LDAP_OPT_PROTOCOL_VERSION, &version);
    ldap_set_option(ldap, LDAP_OPT_X_TLS_REQUIRE_CERT, &demand);
    ldap_set_option(ldap, LDAP_OPT_X_TLS_CACERTFILE, authority);
    ldap_set_option(ldap, LDAP_OPT_X_TLS_NEWCTX, &is_server);
    return ldap_start_tls_s(ldap, NULL, NULL);
}

/* The entry with a user's name, to be freed by ldap_memfree; NULL where it was not found. */
static char* find(LDAP* ldap, const char* name, int* code) {
    char filter[LONGEST_LINE];
    char no_attributes[] = LDAP_NO_ATTRS;
    char* attributes[] = {no_attributes, NULL};
    LDAPMessage* found = NULL;
    char* entry = NULL;
    char* password = strdup(searcher_password);
    *code = sign_in(ldap, searcher, password);
    free(password);
    if (*code == LDAP_SUCCESS) {
        snprintf(filter, sizeof filter, "(&(objectClass=person)(uid=%s))", name);
        *code = ldap_search_ext_s(ldap, base, LDAP_SCOPE_SUBTREE, filter, attributes, 0, NULL, NULL, NULL, 2,
                                  &found);
        LDAPMessage* first = *code == LDAP_SUCCESS ? ldap_first_entry(ldap, found) : NULL;
        entry = first ? ldap_get_dn(ldap, first) : NULL;
        ldap_msgfree(found);
    }
    return entry;
}

static int visit_directory(const struct visit* visit) {
    LDAP* ldap = NULL;
    int code = ldap_initialize(&ldap, address);
    if (code != LDAP_SUCCESS) {
        return code;
    }
    code = prepare(ldap);
    if (code == LDAP_SUCCESS && searcher) {
        char* entry = find(ldap, visit->name, &code);
        if (entry) {
            code = sign_in(ldap, entry, visit->password);
        }
        ldap_memfree(entry);
    } else if (code == LDAP_SUCCESS) {
        code = sign_in(ldap, visit->name, visit->password);
    }
    if (code == LDAP_SUCCESS) {
        struct berval* who = NULL;
        code = ldap_whoami_s(ldap, &who, NULL, NULL);
        ber_bvfree(who);
    }
    ldap_unbind_ext_s(ldap, NULL, NULL);
    return code;
}

static void* work(void* nothing) {
    for (size_t i = atomic_fetch_add(&next_visit, 1); i < visit_count; i = atomic_fetch_add(&next_visit, 1)) {
        const struct visit* visit = &visits[i];
        const double wait = begin + visit->at - now();
        if (wait > 0) {
            const struct timespec time = {(time_t)wait, (long)((wait - (double)(time_t)wait) * 1e9)};
            nanosleep(&time, NULL);
        }
        const double first = now();
        const int code = visit_directory(visit);
        printf("%s\t%f\t%f\t%d\n", visit->name, first - begin, now() - first, code);
    }
    return nothing;
}

static int read_plan(void) {
    char line[LONGEST_LINE];
    size_t room = 0;
    while (fgets(line, sizeof line, stdin)) {
        if (visit_count == room) {
            room = room ? 2 * room : 1024;
            visits = realloc(visits, room * sizeof *visits);
        }
        const char* at = strtok(line, "\t");
        const char* name = strtok(NULL, "\t");
        const char* password = strtok(NULL, "\n");
        if (!visits || !at || !name || !password) {
            return 0;
        }
        visits[visit_count++] = (struct visit){strtod(at, NULL), strdup(name), strdup(password)};
    }
    return 1;
}

int main(int argc, char** argv) {
    pthread_t threads[MOST_THREADS];
    const size_t at_once = argc > 3 ? strtoul(argv[3], NULL, 10) : 0;
    if ((argc != 4 && argc != 7) || at_once == 0 || at_once > MOST_THREADS || !read_plan()) {
        fputs("usage: fleet-binds ADDRESS AUTHORITY AT_ONCE [SEARCHER PASSWORD BASE] < PLAN\n", stderr);
        return 2;
    }
    address = argv[1];
    authority = argv[2];
    searcher = argv[4];
    searcher_password = argc > 5 ? argv[5] : NULL;
    base = argc > 5 ? argv[6] : NULL;
    begin = now();
    for (size_t i = 0; i < at_once; ++i) {
        if (pthread_create(&threads[i], NULL, &work, NULL) != 0) {
            return 1;
        }
    }
    for (size_t i = 0; i < at_once; ++i) {
        pthread_join(threads[i], NULL);
    }
    return 0;
}

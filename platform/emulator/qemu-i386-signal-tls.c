/*
 * Preloaded into 32-bit programs that qemu-i386 runs on this host (only
 * when cmake/Run32.cmake finds the emulator at fault: see
 * signal-tls-probe.c). qemu keeps one GDT TLS descriptor for every thread
 * and reloads %gs from it on sigreturn, so a thread returns from a signal
 * handler with the most recently created thread's TCB: its errno, its
 * thread id and its lock ownership become another thread's, and a
 * reader-writer lock taken afterwards can be left locked for good.
 *
 * Pointing the shared descriptor back at the thread before sigreturn is not
 * enough: two threads returning from handlers at once overwrite each other's
 * repair. Instead a signalled thread moves to a descriptor of its own, an LDT
 * entry holding its thread pointer, and returns with that selector in %gs.
 * qemu's LDT is also one table, but no other thread writes the entry, so any
 * number of threads can return from signals at once.
 *
 * glibc hands a new thread its TLS through the GDT entry named by the
 * creating thread's %gs, which an LDT selector does not name; pthread_create
 * therefore runs with the thread's GDT selector, loaded under a lock with the
 * shared descriptor pointing at the creator and every signal blocked. A
 * thread created here gives its LDT entry back when it ends.
 *
 * Nothing else changes: flags, masks and the handlers' arguments are the
 * program's own. Where the LDT cannot be had, the shared descriptor is
 * pointed back at the thread as before (racy, but better than nothing).
 */
#define _GNU_SOURCE
#include <asm/ldt.h>
#include <dlfcn.h>
#include <pthread.h>
#include <signal.h>
#include <stdint.h>
#include <stdlib.h>
#include <string.h>
#include <sys/syscall.h>
#include <ucontext.h>
#include <unistd.h>

typedef int (*SigactionFn)(int, const struct sigaction*, struct sigaction*);
typedef int (*PthreadCreateFn)(pthread_t*, const pthread_attr_t*, void* (*)(void*), void*);

enum {
    kLdtEntries = LDT_ENTRIES,
    kWordBits = 32,
    kSelectorTableLdt = 4,
    kSelectorRpl3 = 3,
};

static struct sigaction installed[_NSIG];

/* Bit n set: LDT entry n belongs to a thread. Entry 0 is never handed out. */
static uint32_t ldtTaken[kLdtEntries / kWordBits];
static int ldtReady;
static uint16_t gdtSelector;  /* the selector glibc set up for the TLS */
static pthread_mutex_t createLock = PTHREAD_MUTEX_INITIALIZER;
static pthread_key_t ldtOwner;

static uint32_t threadPointer(void) {
    uint32_t self;
    __asm__ volatile("movl %%gs:0, %0" : "=r"(self));
    return self;
}

static uint16_t currentSelector(void) {
    uint16_t selector;
    __asm__ volatile("movw %%gs, %0" : "=r"(selector));
    return selector;
}

static void loadSelector(uint16_t selector) { __asm__ volatile("movw %0, %%gs" : : "r"(selector) : "memory"); }

static int onLdt(uint16_t selector) { return (selector & kSelectorTableLdt) != 0; }

static void describeThread(struct user_desc* desc, unsigned entry, uint32_t base) {
    memset(desc, 0, sizeof *desc);
    desc->entry_number = entry;
    desc->base_addr = base;
    desc->limit = 0xfffff;
    desc->seg_32bit = 1;
    desc->limit_in_pages = 1;
    desc->useable = 1;
}

/* Async-signal-safe: a handler takes an entry without a lock. */
static int takeLdtEntry(void) {
    for (unsigned word = 0; word < kLdtEntries / kWordBits; ++word) {
        uint32_t bits = __atomic_load_n(&ldtTaken[word], __ATOMIC_RELAXED);
        while (bits != UINT32_MAX) {
            const unsigned bit = (unsigned)__builtin_ctz(~bits);
            if (__atomic_compare_exchange_n(&ldtTaken[word], &bits, bits | (1u << bit), 0,
                                            __ATOMIC_ACQ_REL, __ATOMIC_RELAXED)) {
                return (int)(word * kWordBits + bit);
            }
        }
    }
    return -1;
}

static void giveLdtEntry(unsigned entry) {
    __atomic_fetch_and(&ldtTaken[entry / kWordBits], ~(1u << (entry % kWordBits)), __ATOMIC_RELEASE);
}

static void pointGdtAtThisThread(void) {
    struct user_desc desc;
    describeThread(&desc, gdtSelector >> 3, threadPointer());
    syscall(SYS_set_thread_area, &desc);
}

/* The selector this thread returns from the handler with. */
static uint16_t ownSelector(uint16_t interrupted) {
    if (onLdt(interrupted) || !ldtReady) return interrupted;
    const int entry = takeLdtEntry();
    if (entry < 0) return interrupted;
    struct user_desc desc;
    describeThread(&desc, (unsigned)entry, threadPointer());
    if (syscall(SYS_modify_ldt, 1, &desc, sizeof desc) != 0) {
        giveLdtEntry((unsigned)entry);
        return interrupted;
    }
    return (uint16_t)((unsigned)entry << 3 | kSelectorTableLdt | kSelectorRpl3);
}

static void trampoline(int sig, siginfo_t* info, void* context) {
    ucontext_t* uc = context;
    /* Moved before the handler runs, so a handler that jumps out keeps it too. */
    const uint16_t selector = ownSelector((uint16_t)uc->uc_mcontext.gregs[REG_GS]);
    if (selector != currentSelector()) loadSelector(selector);
    uc->uc_mcontext.gregs[REG_GS] = selector;

    const struct sigaction* a = &installed[sig];
    if (a->sa_flags & SA_SIGINFO) {
        a->sa_sigaction(sig, info, context);
    } else if (a->sa_handler != SIG_IGN && a->sa_handler != SIG_DFL) {
        a->sa_handler(sig);
    }
    if (!onLdt(selector)) pointGdtAtThisThread();
}

int sigaction(int sig, const struct sigaction* act, struct sigaction* old) {
    static SigactionFn real;
    if (real == NULL) real = (SigactionFn)dlsym(RTLD_NEXT, "sigaction");
    if (sig <= 0 || sig >= _NSIG) return real(sig, act, old);

    const struct sigaction previous = installed[sig];
    struct sigaction wrapped;
    const struct sigaction* request = act;
    if (act != NULL && ((act->sa_flags & SA_SIGINFO) ||
                        (act->sa_handler != SIG_IGN && act->sa_handler != SIG_DFL))) {
        installed[sig] = *act;  /* before the kernel can call the trampoline */
        wrapped = *act;
        wrapped.sa_flags |= SA_SIGINFO;
        wrapped.sa_sigaction = trampoline;
        request = &wrapped;
    }
    const int result = real(sig, request, old);
    if (result != 0) {
        installed[sig] = previous;
        return result;
    }
    if (old != NULL && old->sa_sigaction == trampoline) {
        old->sa_flags = previous.sa_flags;
        old->sa_sigaction = previous.sa_sigaction;
    }
    return 0;
}

/* Runs as a thread ends, with nothing left of it that a signal should see. */
static void releaseLdtEntry(void* unused) {
    (void)unused;
    const uint16_t selector = currentSelector();
    if (!onLdt(selector)) return;
    sigset_t all;
    sigfillset(&all);
    pthread_sigmask(SIG_SETMASK, &all, NULL);  /* no sigreturn may reload a given-back entry */
    giveLdtEntry(selector >> 3);
}

struct Start {
    void* (*routine)(void*);
    void* arg;
    sigset_t mask;
};

static void* startThread(void* p) {
    struct Start start = *(struct Start*)p;
    free(p);
    if (ldtReady) pthread_setspecific(ldtOwner, &ldtOwner);  /* the key exists only then */
    pthread_sigmask(SIG_SETMASK, &start.mask, NULL);
    return start.routine(start.arg);
}

static void lockForFork(void) { pthread_mutex_lock(&createLock); }
static void unlockAfterFork(void) { pthread_mutex_unlock(&createLock); }

int pthread_create(pthread_t* thread, const pthread_attr_t* attr, void* (*routine)(void*), void* arg) {
    static PthreadCreateFn real;
    if (real == NULL) real = (PthreadCreateFn)dlsym(RTLD_NEXT, "pthread_create");
    struct Start* start = malloc(sizeof *start);
    if (start == NULL) return real(thread, attr, routine, arg);
    start->routine = routine;
    start->arg = arg;

    /* A handler moving this thread to the LDT half-way would hand the new
     * thread a selector that names no TLS; the mask comes back in the child. */
    sigset_t all, callerMask;
    sigfillset(&all);
    pthread_sigmask(SIG_SETMASK, &all, &callerMask);
    start->mask = callerMask;
    pthread_mutex_lock(&createLock);
    const uint16_t selector = currentSelector();
    if (onLdt(selector)) {
        pointGdtAtThisThread();
        loadSelector(gdtSelector);
    }
    const int result = real(thread, attr, startThread, start);
    if (onLdt(selector)) loadSelector(selector);
    pthread_mutex_unlock(&createLock);
    if (result != 0) free(start);  /* otherwise the new thread owns it */
    pthread_sigmask(SIG_SETMASK, &callerMask, NULL);
    return result;
}

__attribute__((constructor)) static void prepareLdt(void) {
    gdtSelector = currentSelector();
    /* qemu gives a thread the LDT only if the table exists when the thread
     * is created: make it now, before the program starts any. */
    struct user_desc desc;
    memset(&desc, 0, sizeof desc);  /* entry 0 stays empty: the kernel's "clear" form */
    desc.read_exec_only = 1;
    desc.seg_not_present = 1;
    ldtTaken[0] = 1u;
    ldtReady = syscall(SYS_modify_ldt, 1, &desc, sizeof desc) == 0 &&
               pthread_key_create(&ldtOwner, releaseLdtEntry) == 0;
    pthread_atfork(lockForFork, unlockAfterFork, unlockAfterFork);
}

/*
 * Preloaded into 32-bit programs that qemu-i386 runs on this host (only
 * when cmake/Run32.cmake finds the emulator at fault: see
 * signal-tls-probe.c). qemu keeps one TLS descriptor for every thread and
 * reloads %gs from it on sigreturn, so a thread returns from a signal
 * handler with the most recently created thread's TCB: its errno, its
 * thread id and its lock ownership become another thread's, and a
 * reader-writer lock taken afterwards can be left locked for good.
 *
 * Every handler installed with sigaction runs through a trampoline that,
 * after the handler, points the shared descriptor at the current thread
 * again, so sigreturn reloads the thread's own pointer as a kernel would.
 * Nothing else changes: flags, masks and the handler's arguments are the
 * program's own.
 */
#define _GNU_SOURCE
#include <asm/ldt.h>
#include <dlfcn.h>
#include <signal.h>
#include <stdint.h>
#include <string.h>
#include <sys/syscall.h>
#include <unistd.h>

typedef int (*SigactionFn)(int, const struct sigaction*, struct sigaction*);

static struct sigaction installed[_NSIG];

static void restoreThreadDescriptor(void) {
    uint32_t self;
    uint16_t selector;
    __asm__ volatile("movl %%gs:0, %0" : "=r"(self));
    __asm__ volatile("movw %%gs, %0" : "=r"(selector));
    struct user_desc desc;
    memset(&desc, 0, sizeof desc);
    desc.entry_number = selector >> 3;
    desc.base_addr = self;
    desc.limit = 0xfffff;
    desc.seg_32bit = 1;
    desc.limit_in_pages = 1;
    desc.useable = 1;
    syscall(SYS_set_thread_area, &desc);
}

static void trampoline(int sig, siginfo_t* info, void* context) {
    const struct sigaction* a = &installed[sig];
    if (a->sa_flags & SA_SIGINFO) {
        a->sa_sigaction(sig, info, context);
    } else if (a->sa_handler != SIG_IGN && a->sa_handler != SIG_DFL) {
        a->sa_handler(sig);
    }
    restoreThreadDescriptor();
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

/*
 * Threads interrupted by signals at the same time must each come back as
 * themselves, also after thousands of signalled threads have come and gone,
 * and a thread that has been signalled must still start threads that are
 * themselves. The link's storm and its destroy signal three threads at once.
 * Exits 0 when all hold, 1 with a line saying which did not.
 */
#define _GNU_SOURCE
#include <pthread.h>
#include <signal.h>
#include <stdint.h>
#include <stdio.h>
#include <unistd.h>

enum { kStormThreads = 3, kStormRounds = 20000, kThreadsComeAndGone = 9000, kTriesPerThread = 20000 };

static __thread int ownTag;
static volatile int stop;
static volatile int foreign;

static void onSignal(int sig) { (void)sig; }

static uintptr_t threadPointer(void) {
    uintptr_t p;
    __asm__ volatile("movl %%gs:0, %0" : "=r"(p));
    return p;
}

static void* spin(void* arg) {
    ownTag = (int)(intptr_t)arg;
    const uintptr_t self = threadPointer();
    while (!stop) {
        if (threadPointer() != self || ownTag != (int)(intptr_t)arg) {
            __atomic_add_fetch(&foreign, 1, __ATOMIC_RELAXED);
            break;
        }
    }
    return NULL;
}

static void* waitForSignal(void* arg) {
    (void)arg;
    const uintptr_t self = threadPointer();
    pause();
    return (void*)(intptr_t)(threadPointer() != self);
}

struct Child {
    uintptr_t pointer;
    int tag;
    int usr1Blocked, usr2Blocked;
};

static void* child(void* arg) {
    struct Child* c = arg;
    sigset_t mask;
    pthread_sigmask(SIG_SETMASK, NULL, &mask);
    c->pointer = threadPointer();
    c->tag = ownTag;
    c->usr1Blocked = sigismember(&mask, SIGUSR1);
    c->usr2Blocked = sigismember(&mask, SIGUSR2);
    return NULL;
}

static int fail(const char* what) {
    printf("%s\n", what);
    return 1;
}

int main(void) {
    struct sigaction action = {0};
    action.sa_handler = onSignal;
    sigemptyset(&action.sa_mask);
    sigaction(SIGUSR1, &action, NULL);

    for (int i = 0; i < kThreadsComeAndGone; ++i) {
        pthread_t t;
        void* replaced = NULL;
        pthread_create(&t, NULL, waitForSignal, NULL);
        int tries = 0;
        do {
            if (++tries > kTriesPerThread) return fail("a signalled thread never returned from its handler");
            pthread_kill(t, SIGUSR1);  /* repeated: the first may come before pause() */
            usleep(100);
        } while (pthread_tryjoin_np(t, &replaced) != 0);
        if (replaced) return fail("a thread signalled alone came back as another");
    }

    pthread_t storm[kStormThreads];
    for (int i = 0; i < kStormThreads; ++i) pthread_create(&storm[i], NULL, spin, (void*)(intptr_t)(i + 1));
    for (int r = 0; r < kStormRounds && !foreign; ++r) {
        for (int i = 0; i < kStormThreads; ++i) pthread_kill(storm[i], SIGUSR1);
        if (r % 64 == 0) usleep(100);
    }
    stop = 1;
    for (int i = 0; i < kStormThreads; ++i) pthread_join(storm[i], NULL);
    if (foreign) return fail("threads signalled at the same time came back as one another");

    /* This thread has been through a handler now; the threads it starts get their own TLS. */
    ownTag = 7;
    const uintptr_t self = threadPointer();
    raise(SIGUSR1);
    sigset_t usr2;
    sigemptyset(&usr2);
    sigaddset(&usr2, SIGUSR2);
    pthread_sigmask(SIG_BLOCK, &usr2, NULL);
    struct Child c = {0, -1, -1, -1};
    pthread_t t;
    if (pthread_create(&t, NULL, child, &c) != 0) return fail("a signalled thread cannot start a thread");
    pthread_join(t, NULL);
    if (threadPointer() != self || ownTag != 7) return fail("starting a thread changed the starter's TLS");
    if (c.pointer == self || c.tag != 0) return fail("a thread started by a signalled thread has the starter's TLS");
    if (c.usr1Blocked || !c.usr2Blocked) return fail("a new thread does not start with its creator's signal mask");
    printf("every signalled thread kept its own thread pointer\n");
    return 0;
}

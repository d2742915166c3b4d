/* SPDX-License-Identifier: Apache-2.0 */
/*
 * A timed question of ActiveDirectoryStore and its RequestState, small enough to try every order of
 * steps. Each caller has a store of its own, asks it a few times, and lets it go; each question that
 * a caller claims gets a worker. A wait may end early at any time, since no clock is modelled.
 *
 * What a run may do is chosen with -D (see `run`, which also says what each run has to show):
 *   TIMEOUTS      waits may time out, and wake up for no reason
 *   HANGS         the provider may never answer
 *   FAILURES      the provider may fail
 *   NO_THREADS    a worker may not be startable
 *   QUESTIONS=1   the trust state alone is asked for; 2: the first caller may also ask for the
 *                 trusted domains
 *   TRUST_WORKERS how many workers for the trust state may run at once
 *   FINE          what is done under a mutex is several steps, and not one; no run finds more with
 *                 it, and the number of orders is too large where there is much to do
 * BUG_... breaks one thing each, to show that the properties can fail.
 */

#ifndef CALLERS
#define CALLERS 2
#endif
#ifndef ASKS
#define ASKS 2
#endif
#ifndef QUESTIONS
#define QUESTIONS 1
#endif
#ifndef TRUST_WORKERS
#define TRUST_WORKERS 1
#endif

#define TRUST_STATE 0
#define TRUSTED_DOMAINS 1
#define REQUESTS (CALLERS * ASKS)

#define NOTHING 0
#define SUCCESS 1
#define FAILURE 2

/* ActiveDirectoryStore::_lock and the flags. */
byte storeLock = 0;
bool flag[QUESTIONS];

/* A cache, held by its store and by the workers that fill it. An answer has two halves, so that one
 * that is written or read half-way can be told. */
typedef Cache {
    byte first;
    byte second;
    byte holders;
    bool freed
}
Cache cache[CALLERS * QUESTIONS];
#define CACHE(caller, question) cache[(caller) * QUESTIONS + (question)]

/* RequestState: held by the caller and by the worker. */
typedef Request {
    byte mutex;
    byte result;   /* NOTHING until done */
    bool waiting;  /* somebody is in the condition's queue */
    bool signalled;
    byte holders;
    bool freed
}
Request request[REQUESTS];

/* For the properties alone. */
byte running[QUESTIONS];
bool unscheduled = false; /* a worker for the trusted domains could not be started */

#define LOCK(mutex) atomic { mutex == 0 -> mutex = _pid + 1 }
#define UNLOCK(mutex) atomic { assert(mutex == _pid + 1); mutex = 0 }
#ifdef FINE
#define SECTION {
#else
#define SECTION atomic {
#endif
#define USE(object) assert(!object.freed)

inline Release(object) {
    atomic {
        assert(!object.freed && object.holders > 0);
        object.holders--;
        if
        :: object.holders == 0 -> object.freed = true
        :: else
        fi
    }
}

inline WriteCache() {
    USE(CACHE(caller, question));
    CACHE(caller, question).first = id + 1;
    CACHE(caller, question).second = id + 1;
}

inline ClearFlag() {
    d_step {
        flag[question] = false;
        running[question]--;
    }
}

/* RequestState::Done */
inline Finish(with) {
    SECTION
        USE(request[id]);
        LOCK(request[id].mutex);
        request[id].result = with;
#ifndef BUG_NO_SIGNAL
        atomic {
            if
            :: request[id].waiting -> request[id].waiting = false; request[id].signalled = true
            :: else
            fi
        };
#endif
        USE(request[id]);
        UNLOCK(request[id].mutex)
    }
}

proctype Worker(byte caller; byte question; byte id) {
    byte result;

    d_step {
        running[question]++;
        assert(question == TRUST_STATE || running[question] <= 1);
        assert(question != TRUST_STATE || running[question] <= TRUST_WORKERS);
        assert(question != TRUSTED_DOMAINS || !unscheduled);
    }
#ifdef BUG_LOCK_ACROSS_CALL
    LOCK(storeLock);
#endif
    /* The provider. */
    assert(storeLock != _pid + 1);
    if
    :: result = SUCCESS
#ifdef FAILURES
    :: result = FAILURE
#endif
#ifdef HANGS
    :: goto end_hanging
#endif
    fi;

#ifdef BUG_DONE_BEFORE_CACHE
    Finish(result);
#endif
#ifdef BUG_FLAG_BEFORE_CACHE
    LOCK(storeLock);
    flag[question] = false;
    UNLOCK(storeLock);
#endif
#ifndef BUG_CACHE_WITHOUT_LOCK
    LOCK(storeLock);
#endif
    if
    :: result == SUCCESS -> WriteCache()
    :: else
    fi;
#ifdef BUG_FLAG_BEFORE_CACHE
    running[question]--;
#else
#ifdef BUG_FAILURE_KEEPS_FLAG
    if
    :: result == SUCCESS -> ClearFlag()
    :: else -> running[question]--
    fi;
#else
    ClearFlag();
#endif
#endif
#ifndef BUG_CACHE_WITHOUT_LOCK
    UNLOCK(storeLock);
#endif
#ifndef BUG_DONE_BEFORE_CACHE
    Finish(result);
#endif
    /* The bound call is destroyed. */
    atomic {
        Release(request[id]);
        Release(CACHE(caller, question))
    };
    goto gone;

end_hanging:
    false;
gone:
    skip
}

/* What the caller does with the mutex held: leaves with what it has seen, or waits. Reaching the
 * condition's queue and releasing the mutex are one step. */
inline LeaveOrWait() {
    atomic {
        USE(request[id]);
        request[id].waiting = (seen == NOTHING && !timedOut);
        UNLOCK(request[id].mutex)
    }
}

/* RequestState::WaitResult; `seen` stays NOTHING where the time has passed first. */
inline Wait() {
#ifdef BUG_DONE_READ_WITHOUT_MUTEX
    seen = request[id].result;
#endif
    SECTION
        LOCK(request[id].mutex);
#ifndef BUG_DONE_READ_WITHOUT_MUTEX
        seen = request[id].result;
#endif
        LeaveOrWait()
    };
    do
    :: seen != NOTHING || timedOut -> break
    :: else ->
        SECTION
            if
            :: atomic { request[id].signalled -> request[id].signalled = false }
#ifdef TIMEOUTS
            /* The time has passed, or a wake-up without a reason. The end may be signalled by now. */
            :: atomic { request[id].waiting = false; request[id].signalled = false; timedOut = true }
            :: atomic { request[id].waiting = false; request[id].signalled = false }
#endif
            fi;
            LOCK(request[id].mutex);
            if
            :: timedOut
            :: else -> seen = request[id].result
            fi;
            LeaveOrWait()
        }
    od
}

proctype Caller(byte caller) {
    byte question, id, asked, seen, first, second;
    bool claimed, timedOut;

    do
    :: asked == ASKS -> break
    :: asked < ASKS ->
        id = caller * ASKS + asked;
        asked++;
        if
        :: question = TRUST_STATE
#if QUESTIONS > 1
        :: caller == 0 -> question = TRUSTED_DOMAINS
#endif
        fi;

#ifdef BUG_FLAG_SET_AFTER_TEST
        claimed = !flag[question];
#endif
        SECTION
            LOCK(storeLock);
#ifndef BUG_FLAG_SET_AFTER_TEST
            claimed = !flag[question];
#endif
            assert(!claimed || question == TRUST_STATE || !unscheduled);
            flag[question] = true;
            UNLOCK(storeLock)
        };

        if
        :: !claimed
        :: claimed ->
            if
            :: d_step {
                    request[id].holders = 2;
                    CACHE(caller, question).holders++;
               };
               run Worker(caller, question, id);
               Wait();
               if
               :: seen == NOTHING ->
#ifdef BUG_WAITER_FREES
                   request[id].freed = true
#else
                   Release(request[id])
#endif
               :: else -> Release(request[id])
               fi
#ifdef NO_THREADS
            :: SECTION
                   LOCK(storeLock);
                   /* The trusted domains' flag stays set, and the other one is cleared. */
                   unscheduled = (unscheduled || question != TRUST_STATE);
#ifdef BUG_OWN_FLAG_CLEARED
                   flag[question] = false;
#else
                   flag[TRUST_STATE] = false;
#endif
                   UNLOCK(storeLock);
                   seen = FAILURE
               }
#endif
            fi
        fi;

        if
        :: seen == FAILURE /* thrown */
        :: else ->
            SECTION
                LOCK(storeLock);
                USE(CACHE(caller, question));
                first = CACHE(caller, question).first;
                second = CACHE(caller, question).second;
                UNLOCK(storeLock);
                /* Whole, and one of this store's; after "done", the very answer of this request,
                 * unless a second worker of the same question had the last word. */
                assert(first == second);
                assert(first == 0 || (first - 1) / ASKS == caller);
                assert(seen != SUCCESS || first != 0);
                assert(seen != SUCCESS || first == id + 1 || TRUST_WORKERS > 1)
            }
        fi;
        /* What is of no use any more would make states differ. */
        d_step {
            id = 0;
            seen = NOTHING;
            claimed = false;
            timedOut = false;
            first = 0;
            second = 0
        }
    od;

    /* The store is destroyed, whatever still runs. */
    atomic {
        Release(CACHE(caller, TRUST_STATE));
#if QUESTIONS > 1
        Release(CACHE(caller, TRUSTED_DOMAINS))
#endif
    }
}

init {
    byte i = 0;
    atomic {
        do
        :: i < CALLERS * QUESTIONS -> cache[i].holders = 1; i++
        :: else -> break
        od;
        i = 0;
        do
        :: i < CALLERS -> run Caller(i); i++
        :: else -> break
        od
    }

    /* When everybody is gone, so is everything. */
#ifdef HANGS
end:
#endif
    _nr_pr == 1;
    atomic {
        assert(storeLock == 0);
        assert(!flag[TRUST_STATE]);
#if QUESTIONS > 1
        assert(flag[TRUSTED_DOMAINS] == unscheduled);
#endif
        i = 0;
        do
        :: i < CALLERS * QUESTIONS -> assert(cache[i].freed); i++
        :: else -> break
        od;
        i = 0;
        do
        :: i < REQUESTS ->
            assert(request[i].freed || request[i].holders == 0);
            assert(request[i].mutex == 0);
            i++
        :: else -> break
        od
    }
}

/*
 * The state machine of a queue (queue_core.h) as a model that spin checks
 * exhaustively: every order in which the atomic steps of a few threads can
 * follow each other. tests/platform/queue_model_test.py runs it; each step names the
 * function of queue_core.h that it stands for. Who changes the one changes the
 * other.
 *
 * What is there: push, drain in batches, queues with a target (ROOT is CHILD's),
 * sync and the sleep of its waiters, suspend and resume, counting what waits, the
 * counts of handles and references, destruction. A queue's target never changes in
 * its life, so nothing here changes it.
 *
 * What is not: orders weaker than sequential consistency (ThreadSanitizer's
 * build has the tests for those; one who counts has a barrier on all threads),
 * the sleeping and waking of workers (pool.h; here a worker comes whenever the pool
 * has work, and a waiter that is a worker sleeps as others do), pumps, forks,
 * statistics and reputations, lingering. What the owner alone looks at may change in
 * one step with what comes before.
 *
 * A configuration is given by macros:
 *   CHILDREN          0: ROOT alone; 1: ROOT and CHILD
 *   PRODUCER0/1       the queue to which it submits; ITEMS0/1: how many pieces, those
 *                     of 0 closures, those of 1 embedded
 *   SYNCED            the queue on which SYNCS threads, 1 or 2, make a sync() each;
 *                     SUBMITS_BEFORE: the only one submits a piece before
 *   SUSPENDED         the queue that one thread suspends and resumes, or two with
 *                     SUSPENDERS=2
 *   WALKED            the queue on which one thread counts what waits
 * and one of the faults below may be put in, by FAULT_…, to see that the checks
 * find it.
 *
 * Checked, by assertions in the steps, and at the end of `init`, when no thread can
 * go on:
 *   - a queue has one owner, and one piece of work of ROOT and CHILD runs at a
 *     time;
 *   - the pieces of one producer run in their order, once each; a sync() after
 *     what its thread submitted before;
 *   - once suspend() has returned, only a piece that is next may still start;
 *   - everything submitted has run when nothing moves any more: no wake-up is lost,
 *     neither of the pool nor of a waiter, and nobody waits for the one who counts;
 *   - nobody touches a queue after its destruction or an item after its end, and
 *     all queues are destroyed once, when the last handle and the last work went.
 */
#define ROOT  0
#define CHILD 1
#define QUEUES (1 + CHILDREN)

/* Items. 0 is the null pointer. */
#define STUB(q)       (1 + (q))
#define PLACE         3 /* CHILD's, in ROOT's list; that of ROOT is `pooled` */
#define FIRST_WAITER  4
#define FIRST_CLOSURE 6
#define CLOSURE(p, k) (FIRST_CLOSURE + 2 * (p) + (k))
#define PRODUCER(x)   (((x) - FIRST_CLOSURE) / 2)
#define NUMBER(x)     (((x) - FIRST_CLOSURE) % 2)
#define ALL_ITEMS     10

#define NOBODY        0 /* as the owner of a queue: that is `init` */
#define ME            _pid
/* The threads that make a sync() are started first, and have a waiter each. */
#define MY_WAITER     (_pid + FIRST_WAITER - 1)
#define THREAD_OF(x)  ((x) - FIRST_WAITER + 1)
#define is_waiter(x)  (x >= FIRST_WAITER && x < FIRST_CLOSURE)
#define is_embedded(x) (x >= CLOSURE(1, 0))

#define BATCH QUEUES

/* queue_core's fields. */
byte tail[QUEUES];
byte head[QUEUES];
byte references[QUEUES];
byte handles[QUEUES];
byte suspensions[QUEUES]; /* suspension_'s count */
bit parked[QUEUES];       /* suspension_'s kParked */
bit counted[QUEUES];

byte successor[ALL_ITEMS];
bit pooled;  /* ROOT's place is in the pool's list */

/* waiter::state, and whether its thread is in futex_wait(). */
#define AWAKE   0
#define ASLEEP  1
#define GRANTED 2
/* With as many threads, those that fall asleep meanwhile are too many states: a waiter
   spins until it is granted. */
#if CHILDREN && defined(SUSPENDED)
#define STAYS_AWAKE
#endif
byte states[2];
bit sleeping[2];
#define state(x)  states[(x) - FIRST_WAITER]
#define sleeps(x) sleeping[(x) - FIRST_WAITER]

#ifdef WALKED
byte running[QUEUES];
bit walked; /* WALKED's */
#endif

/* What the checks remember. */
byte owner[QUEUES];
bit destroyed[QUEUES];
bit live[ALL_ITEMS];   /* closures, and waiters on their stacks */
bit late[QUEUES];      /* suspended, and some piece has started since */
byte ran[2];           /* of a producer's pieces */
byte synced;

#define alive(q) assert(!destroyed[q])
#define exists(x) assert(x < FIRST_WAITER || live[x])
/* Nobody reads what is in it then: one state for whatever it was. */
#define ends(x) live[x] = 0; successor[x] = 0

/* ---- Pieces of work ---- */

#define may_start(q) assert(suspensions[q] == 0 || !late[q])
#define starts(q)    late[q] = suspensions[q] > 0

inline begin_piece(q) {
    assert(owner[q] == ME && owner[ROOT] == ME);
    may_start(ROOT);
    starts(ROOT);
#if CHILDREN
    if
    :: q == CHILD -> may_start(CHILD)
    :: else
    fi;
    starts(CHILD)
#endif
}

/* item::run of a closure, or an embedded item's function, which may delete it. */
inline call(q, x) {
    d_step {
        begin_piece(q);
        assert(live[x] && ran[PRODUCER(x)] == NUMBER(x));
        ran[PRODUCER(x)]++;
        if
        :: is_embedded(x) -> ends(x)
        :: else
        fi
    }
}

/* ---- Life ---- */

/* release_reference() and ~queue_core(). Who finds the count at 1 does not write it,
   and has no rival then: looking and counting down are one step. */
inline release_root() {
    d_step {
        alive(ROOT);
        assert(references[ROOT] > 0);
        references[ROOT]--;
        if
        :: references[ROOT] == 0 -> assert(tail[ROOT] == 0 && handles[ROOT] == 0); destroyed[ROOT] = 1
        :: else
        fi
    }
}

inline release_handle_of_root() {
    d_step { alive(ROOT); handles[ROOT]--; answer = handles[ROOT] == 0 };
    if
    :: answer -> release_root()
    :: else
    fi
}

inline release_reference(q) {
#if CHILDREN
    if
    :: q == ROOT -> release_root()
    :: else ->
        d_step {
            alive(CHILD);
            assert(references[CHILD] > 0);
            references[CHILD]--;
            answer = references[CHILD] == 0;
            if
            :: answer -> assert(tail[CHILD] == 0 && handles[CHILD] == 0); destroyed[CHILD] = 1
            :: else
            fi
        };
        if
        :: answer -> release_handle_of_root()
        :: else
        fi
    fi
#else
    release_root()
#endif
}

/* release(): a handle goes */
inline release(q) {
    d_step {
        alive(q);
        assert(handles[q] > 0);
        handles[q]--;
        answer = handles[q] == 0;
        assert(!answer || suspensions[q] == 0)
    };
    if
    :: answer -> release_reference(q)
    :: else
    fi
}

/* push() by one who found the queue idle, or count_ownership(), in two steps */
inline add_reference(q) {
    d_step {
        alive(q);
#ifndef FAULT_OWNER_HOLDS_NO_REFERENCE
        references[q]++
#endif
    }
}

/* ---- Suspension ---- */

/* park() */
inline park(q) {
    d_step {
        alive(q);
#ifdef FAULT_PARKS_WHATEVER_THE_COUNT
        answer = 1;
#else
        answer = suspensions[q] > 0;
#endif
        if
        :: answer -> assert(owner[q] == ME); owner[q] = NOBODY; parked[q] = 1
        :: else
        fi
    }
}

/* is_suspended(), then park() */
inline park_if_suspended(q) {
    if
    :: suspensions[q] > 0 -> park(q)
    :: else -> answer = 0
    fi
}

/* suspend() */
inline suspend(q) {
    d_step { alive(q); suspensions[q]++; late[q] = 0 }
}

/* resume() */
inline resume(q) {
    d_step {
        alive(q);
        suspensions[q]--;
        late[q] = 0;
        answer = suspensions[q] == 0 && parked[q]
    };
#ifndef FAULT_RESUME_LEAVES_THE_QUEUE_PARKED
    if
    :: answer ->
        d_step {
            alive(q);
#ifndef FAULT_RESUME_LOOKS_ONCE
            answer = suspensions[q] == 0 && parked[q];
#endif
            if
            :: answer -> assert(owner[q] == NOBODY); owner[q] = ME; parked[q] = 0
            :: else
            fi
        };
        if
        :: answer -> activate(q)
        :: else
        fi
    :: else
    fi
#endif
}

/* ---- The list ---- */

#ifdef WALKED
inline begin_list_at(q, item, first) {
    head[q] = first;
    running[q] = item
}
#define now_runs(q, x) running[q] = x
/* let_walk() and wait_for_walk() */
#ifdef FAULT_NOBODY_LETS_WALK
#define let_walk(q)
#else
#define let_walk(q) (q != WALKED || !walked)
#endif
#else
#define begin_list_at(q, item, first) head[q] = first
#define now_runs(q, x)
#define let_walk(q)
#endif

/* push()'s exchange; who finds null is the owner and sets its fields */
inline exchange_tail(q, x) {
    d_step {
        alive(q);
        live[x] = 1;
        successor[x] = 0;
        previous = tail[q];
        tail[q] = x;
        if
        :: previous == 0 ->
            assert(owner[q] == NOBODY);
            owner[q] = ME;
            counted[q] = 1;
#ifndef WALKED
            head[q] = x
#endif
        :: else
        fi;
#if CHILDREN
        if
        :: x == PLACE -> assert(owner[CHILD] == ME); owner[CHILD] = NOBODY
        :: else
        fi
#endif
    }
}

inline link(x) {
    d_step { exists(previous); successor[previous] = x }
}

/* activate() of a queue without target: pool::submit() */
inline activate_root() {
    park_if_suspended(ROOT);
    if
    :: answer
    :: else -> d_step { alive(ROOT); assert(!pooled && owner[ROOT] == ME); owner[ROOT] = NOBODY; pooled = 1 }
    fi
}

inline push_root(x) {
    exchange_tail(ROOT, x);
    if
    :: previous -> link(x)
    :: else ->
#ifdef WALKED
        begin_list_at(ROOT, 0, x);
#endif
        add_reference(ROOT);
        activate_root()
    fi
}

/* activate() */
inline activate(q) {
#if CHILDREN
    if
    :: q == ROOT -> activate_root()
    :: else ->
        park_if_suspended(CHILD);
        if
        :: answer
        :: else -> push_root(PLACE)
        fi
    fi
#else
    activate_root()
#endif
}

/* push() */
inline push(q, x) {
    exchange_tail(q, x);
    if
    :: previous ->
        link(x)
#ifdef FAULT_EVERY_PUSH_ACTIVATES
        ; activate(q)
#endif
    :: else ->
#ifdef WALKED
        begin_list_at(q, 0, x);
#endif
        add_reference(q);
        activate(q)
    fi
}

/* wait_for_next(): its spinning is waiting here */
inline wait_for_next(x) {
    d_step { successor[x] != 0 -> following = successor[x] }
}

/* detach(), and the list begins with the successor of `x`, or null with the stub in
   its place */
inline detach(q, x) {
    following = successor[x];
    if
    :: following
    :: else ->
        d_step {
            alive(q);
            answer = tail[q] == x;
            if
            :: answer -> tail[q] = STUB(q)
            :: else
            fi
        };
        if
        :: answer
        :: else -> wait_for_next(x)
        fi
    fi;
    begin_list_at(q, STUB(q), following)
}

/* attach() of the caller's waiter */
inline attach(q) {
    d_step { following = head[q]; live[MY_WAITER] = 1; successor[MY_WAITER] = 0 };
    if
    :: following
    :: else ->
        d_step {
            alive(q);
            answer = tail[q] == STUB(q);
            if
            :: answer -> tail[q] = MY_WAITER
            :: else
            fi
        };
        if
        :: answer
        :: else -> wait_for_next(STUB(q)); successor[STUB(q)] = 0
        fi
    fi;
    d_step {
        if
        :: following -> successor[MY_WAITER] = following
        :: else
        fi;
#ifndef WALKED
        head[q] = MY_WAITER
#endif
    };
#ifdef WALKED
    begin_list_at(q, STUB(q), MY_WAITER)
#endif
}

/* The compare-exchange of the tail to null: `answer` when ownership was given up */
inline give_up(q, last) {
    d_step {
        alive(q);
#ifdef FAULT_GIVES_UP_WITHOUT_COMPARING
        answer = 1;
#else
        answer = tail[q] == last;
#endif
        if
        :: answer ->
            tail[q] = 0;
            owner[q] = NOBODY;
            live[last] = 0;
#ifndef WALKED
            head[q] = 0
#endif
        :: else
        fi
    }
}

/* leave(): `following` is 0 when ownership was given up */
inline leave(q, last) {
#ifdef WALKED
    do
    :: begin_list_at(q, STUB(q), 0);
        if
        :: q != WALKED || !walked -> break
        :: else
        fi;
#ifndef FAULT_LEAVER_IS_WAITED_FOR
        begin_list_at(q, last, 0);
#endif
        let_walk(q)
    od;
#endif
    give_up(q, last);
    if
    :: answer -> following = 0
    :: else -> wait_for_next(last)
    fi
}

/* take_after_stub(): `following` is 0 when ownership was given up */
inline take_after_stub(q) {
    following = successor[STUB(q)];
    if
    :: following
    :: else ->
        give_up(q, STUB(q));
        if
        :: answer
        :: else -> wait_for_next(STUB(q))
        fi
    fi;
    if
    :: following -> successor[STUB(q)] = 0
    :: else
    fi
}

#define put_back(q, work) begin_list_at(q, 0, work)

/* head_, or what comes after the stub */
inline take_next(q) {
    following = head[q];
    if
    :: following
    :: else -> take_after_stub(q)
    fi
}

/* ---- sync ---- */

/* waiter::grant(): with the queue come its targets. The waiter may be gone before it
   is woken. */
inline grant_to(q, x) {
#ifdef FAULT_GRANTS_TO_WHO_WAS_AWAKE
    answer = state(x) == ASLEEP;
#endif
    d_step {
        exists(x);
        assert(state(x) != GRANTED && owner[q] == ME && owner[ROOT] == ME);
#ifndef FAULT_GRANTS_TO_WHO_WAS_AWAKE
        answer = state(x) == ASLEEP;
#endif
        state(x) = GRANTED;
        owner[q] = THREAD_OF(x);
        owner[ROOT] = THREAD_OF(x)
    };
    if
    :: answer -> sleeps(x) = 0
    :: else
    fi
}

/* grant() */
inline grant(q, x) {
#ifdef FAULT_GRANTS_BEFORE_DETACHING
    grant_to(q, x);
    detach(q, x)
#else
    detach(q, x);
    let_walk(q);
    grant_to(q, x)
#endif
}

/* try_lock() */
inline try_lock(q) {
    d_step {
        alive(q);
        answer = tail[q] == 0;
        if
        :: answer ->
            assert(owner[q] == NOBODY);
            tail[q] = STUB(q);
            owner[q] = ME;
            counted[q] = 0;
#ifndef WALKED
            head[q] = 0
#endif
        :: else
        fi
    };
#ifdef WALKED
    if
    :: answer -> begin_list_at(q, STUB(q), 0)
    :: else
    fi
#endif
}

/* waiter::wait(), and the end of the waiter's life. Its spinning is coming late to the
   first step; futex_wait() that finds another state is the next look at it. */
inline wait_until_granted() {
#ifndef STAYS_AWAKE
    d_step {
        if
        :: state(MY_WAITER) == AWAKE -> state(MY_WAITER) = ASLEEP
        :: else
        fi
    };
#endif
    do
    :: d_step { !sleeps(MY_WAITER) && state(MY_WAITER) == ASLEEP -> sleeps(MY_WAITER) = 1 }
    :: atomic {
            !sleeps(MY_WAITER) && state(MY_WAITER) == GRANTED ->
            assert(owner[ROOT] == ME);
            state(MY_WAITER) = AWAKE;
            ends(MY_WAITER)
        };
        break
    od
}

/* wait_for_ownership() */
inline wait_for_ownership(q) {
    push(q, MY_WAITER);
    wait_until_granted()
}

/* wait_for_resume() */
inline wait_for_resume(q) {
    attach(q);
    count_ownership(q);
#if CHILDREN
    if
    :: q == CHILD -> unlock_root()
    :: else
    fi;
#endif
    activate(q);
    wait_until_granted()
}

inline count_ownership(q) {
    if
    :: counted[q]
    :: else -> counted[q] = 1; add_reference(q)
    fi
}

/* unlock() */
inline unlock_root() {
    was_counted = counted[ROOT];
    take_next(ROOT);
    if
    :: following == 0 ->
        if
        :: was_counted -> release_root()
        :: else
        fi
    :: else ->
        begin_list_at(ROOT, STUB(ROOT), following);
        count_ownership(ROOT);
        if
        :: is_waiter(following) && suspensions[ROOT] == 0 ->
            granted_next = following;
            grant(ROOT, granted_next)
        :: else -> activate_root()
        fi
    fi
}

#if CHILDREN
inline unlock_child() {
    was_counted = counted[CHILD];
    take_next(CHILD);
    if
    :: following == 0 ->
        if
        :: was_counted -> release_reference(CHILD)
        :: else
        fi
    :: else ->
        begin_list_at(CHILD, STUB(CHILD), following);
        count_ownership(CHILD);
        activate(CHILD)
    fi
}
#endif

/* ---- Threads ---- */

/* One that submits: each in its turn, then it drops its handle. */
inline produce(p, q, items) {
    do
    :: i == items -> break
    :: else -> push(q, CLOSURE(p, i)); i++
    od;
    release(q)
}

#define LOCALS bit answer; bit was_counted; byte previous; byte following

#ifdef PRODUCER0
proctype producer0() {
    LOCALS;
    byte i;
    produce(0, PRODUCER0, ITEMS0)
}
#endif
#ifdef PRODUCER1
proctype producer1() {
    LOCALS;
    byte i;
    produce(1, PRODUCER1, ITEMS1)
}
#endif

#ifdef SUSPENDED
#ifndef SUSPENDERS
#define SUSPENDERS 1
#endif
proctype suspender() {
    LOCALS;
    suspend(SUSPENDED);
    resume(SUSPENDED);
    release(SUSPENDED)
}
#endif

#ifdef SYNCED
/* run_sync(). What it submits before is producer 1's. */
proctype syncer() {
    LOCALS;
    byte level; /* QUEUES for none */
    byte below;
    byte granted_next;
#ifdef SUBMITS_BEFORE
    push(SYNCED, CLOSURE(1, 0));
#endif
    /* lock_from_here() */
    level = SYNCED;
#if CHILDREN
    if
    :: level == CHILD -> try_lock(CHILD); level = (answer -> ROOT : CHILD)
    :: else -> answer = 1
    fi;
    if
    :: answer -> try_lock(ROOT); level = (answer -> QUEUES : ROOT)
    :: else
    fi;
#else
    try_lock(ROOT);
    level = (answer -> QUEUES : ROOT);
#endif
    if
    :: level == QUEUES
    :: else -> wait_for_ownership(level)
    fi;
#ifndef FAULT_SYNC_LOOKS_AT_SUSPENSION_ONCE
    below = SYNCED;
    do
    :: below == level -> break
    :: else ->
        if
        :: suspensions[below] > 0 -> wait_for_resume(below); level = below; below = SYNCED
        :: else -> below = (below == CHILD -> ROOT : QUEUES)
        fi
    od;
#endif
    atomic {
        begin_piece(SYNCED);
#ifdef SUBMITS_BEFORE
        assert(ran[1] == 1);
#endif
        synced++
    };
    /* unlock_chain() */
#if CHILDREN
    if
    :: SYNCED == CHILD -> unlock_child()
    :: else
    fi;
#endif
    unlock_root();
    release(SYNCED)
}
#endif

/* pool::run(), run_owned() of ROOT, and drain() of whichever `queue` is: ROOT, or
   CHILD as a piece of ROOT's. Whether other work waits in
   the pool when it is over is left open. */
proctype worker() {
    LOCALS;
    byte queue;
    byte work;
    byte budget;
end:
    atomic { pooled -> pooled = 0 };
    queue = ROOT;
    budget = BATCH;

drain:
    atomic {
        alive(queue);
        assert(owner[queue] == NOBODY);
        owner[queue] = ME;
        work = head[queue]
    };
    now_runs(queue, work);

next_piece:
    if
    :: suspensions[queue] > 0 ->
        put_back(queue, work);
        park(queue);
        if
        :: answer -> goto parked_or_idle
        :: else -> now_runs(queue, work)
        fi
    :: else
    fi;
#if CHILDREN && !defined(FAULT_TARGETS_SUSPENSION_WAITS_FOR_THE_CHILD)
    if /* is_held_back() of what is above */
    :: queue == CHILD && suspensions[ROOT] > 0 -> goto more
    :: else
    fi;
#endif
    if
    :: budget > 0 -> budget--
    :: budget == 0 -> goto more
    :: budget == 0 -> budget = BATCH - 1
    fi;
    if
    :: is_waiter(work) ->
        grant(queue, work);
        goto end
#if CHILDREN
    :: work == PLACE -> /* run_nested() */
        detach(ROOT, PLACE);
        let_walk(ROOT);
        queue = CHILD;
        goto drain
#endif
    :: is_embedded(work) -> /* run_nested() */
        detach(queue, work);
        let_walk(queue);
        call(queue, work);
        goto nested_done
    :: work >= FIRST_CLOSURE && !is_embedded(work) ->
        call(queue, work);
        following = successor[work];
        if
        :: following
        :: else ->
            leave(queue, work);
            if
            :: following
            :: else -> goto idle
            fi
        fi;
        now_runs(queue, following);
        let_walk(queue);
        d_step { ends(work); work = following };
        goto next_piece
    fi;

nested_done:
    take_next(queue);
    work = following;
    if
    :: work -> now_runs(queue, work); goto next_piece
    :: else -> goto idle
    fi;

more:
    put_back(queue, work);
    activate(queue);
    goto parked_or_idle;

idle:
    release_reference(queue);

parked_or_idle: /* on with ROOT's list after a piece that was CHILD's */
#if CHILDREN
    if
    :: queue == CHILD -> queue = ROOT; goto nested_done
    :: else
    fi;
#endif
    goto end
}

#ifdef WALKED
/* count_waiting(). Its handle is here for what keeps the queue alive. */
proctype walker() {
    bit answer;
    byte first;
    byte last;
    byte from;
    byte from_head;
    walked = 1;
first_waiting:
    last = tail[WALKED];
    from = running[WALKED];
    from_head = 0;
    if
    :: last == 0 || last == from -> goto walk
    :: else
    fi;
    if
    :: from && from != STUB(WALKED)
    :: else -> from_head = head[WALKED]; first = from_head
    fi;
    if
    :: from_head
    :: else ->
        d_step {
            exists((from -> from : STUB(WALKED)));
            first = successor[(from -> from : STUB(WALKED))]
        }
    fi;
    if
    :: first
    :: else -> /* once it does not find the same again */
        (tail[WALKED] != last || running[WALKED] != from || head[WALKED] != from_head ||
         successor[(from -> from : STUB(WALKED))] != 0);
        goto first_waiting
    fi;
walk:
    last = tail[WALKED];
    do
    :: first == 0 -> break
    :: else ->
        d_step {
            assert(first >= PLACE);
            exists(first);
            first = (first == last -> 0 : successor[first])
        }
    od;
    walked = 0;
    release(WALKED)
}
#endif

/* Starts the threads, and looks once none of them can go on: each is at its end, or
   waits for what nobody will do. */
init {
    atomic {
        references[ROOT] = 1;
        handles[ROOT] = CHILDREN;
#if CHILDREN
        references[CHILD] = 1;
#endif
#ifdef SYNCED
        handles[SYNCED] = handles[SYNCED] + SYNCS;
        run syncer();
#if SYNCS == 2
        run syncer();
#endif
#endif
#ifdef PRODUCER0
        handles[PRODUCER0]++;
        run producer0();
#endif
#ifdef PRODUCER1
        handles[PRODUCER1]++;
        run producer1();
#endif
#ifdef SUSPENDED
        handles[SUSPENDED] = handles[SUSPENDED] + SUSPENDERS;
        run suspender();
#if SUSPENDERS == 2
        run suspender();
#endif
#endif
#ifdef WALKED
        running[ROOT] = STUB(ROOT);
#if CHILDREN
        running[CHILD] = STUB(CHILD);
#endif
        handles[WALKED]++;
        run walker();
#endif
        run worker();
        run worker()
    };
    timeout;
    d_step {
#ifdef PRODUCER0
        assert(ran[0] == ITEMS0);
#endif
#ifdef PRODUCER1
        assert(ran[1] == ITEMS1);
#endif
#ifdef SUBMITS_BEFORE
        assert(ran[1] == 1);
#endif
#ifdef SYNCED
        assert(synced == SYNCS);
#endif
#if CHILDREN
        assert(destroyed[CHILD]);
#endif
        assert(destroyed[ROOT])
    }
}

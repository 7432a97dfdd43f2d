/*
 * The update protocol of src/cache/cache.cpp, one step for each system call that others can notice.
 * run.sh says which properties are checked of which variants, docs/cache.md what follows from it.
 *
 * There are three places in the process table. A process is born into a free one, by the world or by
 * a fork, with a new id or with that of the place's last process, and reads the cache as often as
 * the world likes; whether it must have fresh data is open each time. It may be killed between any
 * two steps. One that the world leaves alone is also a process that has nothing to do with the cache
 * and merely got an updater's id.
 *
 * A pause is no step: the others may always be faster. The tries for a lock are one step: it
 * succeeds when the lock is free, and may give up when it is not. Taking a lock is one step with the
 * first look under it, freeing it one with the last: nobody can tell the difference.
 *
 * Variants, each a -D: conditions of the world,
 *   ID_ONLY            pid files hold no start time
 *   NO_KILLS           nobody is killed; processes end all the same when they have nothing to do
 *   CERTAIN_LOCKS      nobody gives up on a lock
 *   LOCK_FAULTS        the lock file cannot be opened, now and then
 *   READ_FAULTS        the pid file cannot be opened for reading, now and then
 *   OUTSIDER           somebody removes the pid file by hand
 *   ONLY_OLD           data is refreshed because it is old, and for no other reason
 *   ONLY_MARKED        nobody writes the cache file without having marked itself
 *   ALL_BLOCK          all readers must have fresh data
 *   UNNOTICED_BIRTHS   a birth does not count as a disturbance of a lone reader
 * and changes of the protocol, which show that the checks can fail:
 *   NO_LOCK  SHARED_MARKING  NO_SECOND_LOOK  BLIND_REMOVAL  UNLOCKED_REMOVAL  NO_LIFE_CHECK
 *   WAIT_FOR_FRESH  WAIT_FOR_UPDATER
 * CHECK_... compiles a property in.
 */

#define Places 3 /* numbered from 1 */

/* Where a process stands, in the order of the code. */
#define None 0         /* there is none */
#define Rest 1         /* between two reads */
#define Update 2       /* found its data stale */
#define UpdateSeen 3   /*     has read the pid file, shared lock held, as in all named Seen */
#define Wait 4         /* WaitForUpdater */
#define WaitSeen 5
#define Refresh 6      /* also where a child begins */
#define RefreshSeen 7
#define Set 8          /* SetUpdating */
#define SetSeen 9      /*     exclusive lock held */
#define SetFree 10     /*     so, and nobody else is at it */
#define Produce 11     /* marked; DoUpdate */
#define Unset 12       /* UnsetUpdating */
#define UnsetSeen 13
#define UnsetAgain 14  /*     a living process is marked; shared lock held */
#define UnsetRemove 15 /*     shared lock held */

byte at[Places + 1];

/*
 * Whose id stands in the pid file: 0 for none; p for the process in place p, which may have ended
 * since; Places + p for an earlier one that had the id of the one in place p; Gone for one whose id
 * nobody has.
 */
#define Gone (2 * Places + 1)
byte mark;
byte seen[Places + 1]; /* what each has read of it */

bit fresh;   /* the cache file is not older than the time-out */
bit retired; /* nobody is born, killed or asked to read any more */

#define Place(id) ((id) - Places * ((id) > Places)) /* no condition: claims know none */
#define HasProcess(id) ((id) != 0 && (id) != Gone && at[Place(id)] != None)
#define IsOwners(id) ((id) != 0 && (id) <= Places && at[id] != None)
#define IsUpdater(p) (at[p] >= Produce)
#ifdef ID_ONLY
#define Counts(id) HasProcess(id)
#else
#define Counts(id) IsOwners(id)
#endif

/* The lock. Who holds it follows from where all stand. */
#define Marks(p) (at[p] == SetSeen || at[p] == SetFree)
#define Probes(p) (at[p] == UpdateSeen || at[p] == WaitSeen || at[p] == RefreshSeen)
#ifdef UNLOCKED_REMOVAL
#define Removes(p) false
#else
#define Removes(p) (at[p] >= UnsetSeen)
#endif
#define Exclusive (Marks(1) || Marks(2) || Marks(3))
#define Shared(p) (Probes(p) || Removes(p))
#ifdef NO_LOCK
#define MayShare true
#define MayExclude true
#else
#ifdef SHARED_MARKING
#define MayShare true
#define MayExclude true
#else
#define MayShare (!Exclusive)
#define MayExclude (!Exclusive && !Shared(1) && !Shared(2) && !Shared(3))
#endif
#endif
#ifdef LOCK_FAULTS
#define GivesUp(may) true
#else
#ifdef CERTAIN_LOCKS
#define GivesUp(may) false
#else
#define GivesUp(may) (!(may))
#endif
#endif

/* Two processes never refresh at the same time. */
#ifdef CHECK_ONE_UPDATER
#define AssertOneUpdater assert(!IsUpdater(1) && !IsUpdater(2) && !IsUpdater(3))
#else
#define AssertOneUpdater skip
#endif
/* Nobody removes the mark of another living updater. */
#ifdef CHECK_OWN_REMOVAL
#define AssertOwnRemoval assert(mark == me || !IsOwners(mark))
#else
#define AssertOwnRemoval skip
#endif
/* A refresh begins only while data is old. */
#ifdef CHECK_NO_LATE_REFRESH
#define AssertNoLateRefresh assert(!fresh)
#else
#define AssertNoLateRefresh skip
#endif
/* A process that has nothing to do has left no mark. */
#ifdef CHECK_NO_MARK_STAYS
#define AssertNoMarkStays assert(mark != me)
#else
#define AssertNoMarkStays skip
#endif
/* Nobody waits for itself. */
#ifdef CHECK_NO_SELF_WAIT
#define AssertNoSelfWait assert(!Counts(mark) || Place(mark) != me)
#else
#define AssertNoSelfWait skip
#endif
/* Who has waited has fresh data. */
#ifdef CHECK_WAIT_BRINGS_FRESH
#define AssertWaitBroughtFresh assert(fresh)
#else
#define AssertWaitBroughtFresh skip
#endif
/* Who does not become the updater because another one is does not come back with old data. */
#ifdef CHECK_LOSER_WAITS
#define AssertLoserWaits assert(fresh || !IsOwners(mark))
#else
#define AssertLoserWaits skip
#endif

/* The one in place 1 waits for an updater at work until something is written or an updater ends. */
#ifdef CHECK_WAIT_BRINGS_NEWS
bit news;
#define News news = true
#define NoNews news = (news && me != 1)
#define AtWork (at[1] == Produce || at[2] == Produce || at[3] == Produce)
#define AssertNews assert(news || !AtWork || me != 1)
#else
#define News skip
#define NoNews skip
#define AssertNews skip
#endif

/*
 * A reader in place 1 whom nobody disturbs meets no updater: all others have had nothing to do since
 * it began, and the mark, if there was one, was not that of a living process.
 */
#ifdef CHECK_LONE_READER
bit lone;
#define BeginsToRead(p) lone = (p == 1 && at[2] <= Rest && at[3] <= Rest && !IsOwners(mark))
#define AssertNotLone assert(!lone || me != 1)
#ifdef UNNOTICED_BIRTHS
#define IsBorn(p) skip
#else
#define IsBorn(p) lone = false
#endif
#else
#define BeginsToRead(p) skip
#define AssertNotLone skip
#define IsBorn(p) skip
#endif

/* A new process in place p: whoever has read the id of the last one there holds a stale one. */
#define WithSameId(id, p) (id == p -> Places + p : id)
#define WithNewId(id, p) (Place(id) == p -> Gone : id)
inline Bear(p, where) {
    if
    :: mark = WithSameId(mark, p);
       seen[1] = WithSameId(seen[1], p);
       seen[2] = WithSameId(seen[2], p);
       seen[3] = WithSameId(seen[3], p)
    :: mark = WithNewId(mark, p);
       seen[1] = WithNewId(seen[1], p);
       seen[2] = WithNewId(seen[2], p);
       seen[3] = WithNewId(seen[3], p)
    fi;
    IsBorn(p);
    at[p] = where
}

/* The lock goes with the process, its mark stays. */
inline Kill(p) {
    News;
    seen[p] = 0;
    at[p] = None
}

/* RefreshInChild, where there is a place for it. */
inline Fork() {
    if
    :: at[1] == None -> Bear(1, Refresh)
    :: at[2] == None -> Bear(2, Refresh)
    :: at[3] == None -> Bear(3, Refresh)
    :: at[1] != None && at[2] != None && at[3] != None
    fi
}

/* CoreLibReadPidFile: the file, which is replaced whole, and whether its process is a later one. */
inline ReadMark() {
    if
    :: seen[me] = mark
#ifdef READ_FAULTS
    :: seen[me] = 0
#endif
    fi;
#ifndef ID_ONLY
    seen[me] = (HasProcess(seen[me]) && seen[me] > Places -> 0 : seen[me])
#endif
}

/* CoreLibProcAlive, a step later: in between the process may end, and another one get its id. */
#ifdef NO_LIFE_CHECK
#define SeenLives (seen[me] != 0)
#else
#define SeenLives HasProcess(seen[me])
#endif

inline GoTo(where) {
    seen[me] = 0;
    at[me] = where
}

/* The caller has its data. A child ends here, and others may. */
inline Finish() {
    seen[me] = 0;
    if
    :: AssertNoMarkStays; at[me] = Rest
    :: at[me] = None
    fi
}

/* Update, when somebody is at it: wait, or be content with old data. */
inline MeetUpdater() {
    AssertNotLone;
    if
    :: AssertNoSelfWait; NoNews; GoTo(Wait)
#ifndef ALL_BLOCK
    :: Finish()
#endif
    fi
}

/* Update, when nobody is: refresh, or have a child do that. */
inline MeetNobody() {
    if
    :: GoTo(Refresh)
#ifndef ALL_BLOCK
    :: Fork(); Finish()
#endif
    fi
}

inline GiveUpRefresh() {
    AssertNotLone;
    AssertLoserWaits;
    Finish()
}

inline RemoveMark() {
    AssertOwnRemoval;
    mark = 0;
    News;
    Finish()
}

active [Places] proctype Process() {
    byte me = _pid + 1;

endRest:
    do
    :: atomic { at[me] == Update && MayShare -> ReadMark(); at[me] = UpdateSeen }
    :: atomic { at[me] == Update && GivesUp(MayShare) -> MeetUpdater() }
    :: atomic { at[me] == UpdateSeen && SeenLives -> MeetUpdater() }
    :: atomic { at[me] == UpdateSeen && !SeenLives -> MeetNobody() }

    :: atomic { at[me] == Wait && MayShare -> ReadMark(); at[me] = WaitSeen }
#ifdef WAIT_FOR_FRESH
    :: atomic { at[me] == WaitSeen -> if :: fresh -> Finish() :: else -> GoTo(Wait) fi }
#else
    :: atomic { at[me] == WaitSeen && !SeenLives -> AssertWaitBroughtFresh; Finish() }
#ifdef WAIT_FOR_UPDATER
    :: atomic { at[me] == WaitSeen && SeenLives -> GoTo(Wait) }
#else
    :: atomic { at[me] == Wait && GivesUp(MayShare) && fresh -> Finish() }
    :: atomic { at[me] == Wait && GivesUp(MayShare) && !fresh -> skip }
    :: atomic { at[me] == WaitSeen && SeenLives && fresh -> AssertNews; Finish() }
    :: atomic { at[me] == WaitSeen && SeenLives && !fresh -> GoTo(Wait) }
#endif
#endif

    :: atomic { at[me] == Refresh && MayShare -> ReadMark(); at[me] = RefreshSeen }
    :: atomic { at[me] == Refresh && GivesUp(MayShare) -> GiveUpRefresh() }
    :: atomic { at[me] == RefreshSeen && SeenLives -> GiveUpRefresh() }
    :: atomic { at[me] == RefreshSeen && !SeenLives -> GoTo(Set) }

    :: atomic { at[me] == Set && MayExclude -> ReadMark(); at[me] = SetSeen }
    :: atomic { at[me] == Set && GivesUp(MayExclude) -> GiveUpRefresh() }
#ifdef NO_SECOND_LOOK
    :: atomic { at[me] == SetSeen -> GoTo(SetFree) }
#else
    :: atomic { at[me] == SetSeen && SeenLives -> GiveUpRefresh() }
    :: atomic { at[me] == SetSeen && !SeenLives -> GoTo(SetFree) }
#endif
    :: atomic {
           at[me] == SetFree -> AssertOneUpdater;
           AssertNoLateRefresh;
           mark = me;
           at[me] = Produce
       }
    :: atomic { at[me] == SetFree -> Finish() } /* the pid file cannot be written */

    :: atomic { at[me] == Produce -> fresh = true; News; at[me] = Unset }
    :: atomic { at[me] == Produce -> at[me] = Unset } /* no data, or none that could be written */

#ifdef BLIND_REMOVAL
    :: atomic { at[me] == Unset -> RemoveMark() }
#else
#ifdef UNLOCKED_REMOVAL
    :: atomic { at[me] == Unset -> ReadMark(); at[me] = UnsetSeen }
#else
    :: atomic { at[me] == Unset && MayShare -> ReadMark(); at[me] = UnsetSeen }
    :: atomic { at[me] == Unset && GivesUp(MayShare) -> News; Finish() } /* the mark stays */
#endif
#ifdef LOCK_FAULTS
    :: atomic { at[me] == UnsetSeen -> GoTo(UnsetAgain) }
#endif
    :: atomic { at[me] == UnsetSeen && SeenLives -> GoTo(UnsetAgain) }
    :: atomic { at[me] == UnsetSeen && !SeenLives -> GoTo(UnsetRemove) }
    :: atomic {
           at[me] == UnsetAgain -> ReadMark();
           if
           :: Place(seen[me]) == me -> GoTo(UnsetRemove)
           :: else -> News; Finish()
           fi
       }
    :: atomic { at[me] == UnsetRemove -> RemoveMark() }
#endif
    od
}

#ifdef ONLY_OLD
#define MayRead !fresh
#else
#define MayRead true /* or what is there is refused by its looks, or Update() is called by itself */
#endif
#ifdef NO_KILLS
#define MayEnd(p) (at[p] == Rest)
#else
#define MayEnd(p) (at[p] != None)
#endif

inline Disturb(p) {
    if
    :: at[p] == None -> Bear(p, Rest)
    :: at[p] == Rest && MayRead -> BeginsToRead(p); at[p] = Update
    :: MayEnd(p) -> Kill(p)
    :: else
    fi
}

/* It may retire at any time, or never: nothing has to happen. */
active proctype World() {
    do
    :: atomic { true -> Disturb(1) }
    :: atomic { true -> Disturb(2) }
    :: atomic { true -> Disturb(3) }
    :: atomic { fresh -> fresh = false }
#ifndef ONLY_MARKED
    :: atomic { !fresh -> fresh = true; News } /* UpdateWithData(), called by itself */
#endif
#ifdef OUTSIDER
    :: atomic { mark != 0 -> mark = 0 }
#endif
    :: atomic { true -> retired = true; break }
    od
}

#define Ends [](at[1] > Rest -> <>(at[1] <= Rest)) /* every read of the one in place 1 */

/* Once the world is quiet, and the data fresh or no updater marked. */
#ifdef CHECK_READ_ENDS
ltl { (<>retired && <>[](fresh || !Counts(mark))) -> Ends }
#endif
/* However many are born, killed and asked, once the lock is free and the marked id nobody's. */
#ifdef CHECK_READ_ENDS_IN_A_CROWD
ltl { <>[]((fresh || !HasProcess(mark)) && !Exclusive) -> Ends }
#endif
/* Once the world is quiet and nobody refreshes. */
#ifdef CHECK_READ_ENDS_WITH_REFRESHES
ltl { (<>retired && <>[](!IsUpdater(1) && !IsUpdater(2) && !IsUpdater(3))) -> Ends }
#endif
/* When the data is fresh again and again, and it looks again and again. */
#ifdef CHECK_READ_ENDS_BY_FRESH_MOMENTS
ltl { ([]<>fresh && []<>(at[1] == WaitSeen)) -> Ends }
#endif

/*
 * The update protocol of src/cache/, with one step for each system call that other processes can notice.
 * run.sh lists which properties are checked in which variants, README.md the consequences.
 *
 * The process table has three places. A new process takes a free one, started by the world or by a fork,
 * with a new id or the id of the place's last process. It reads the cache as often as the world wants, and
 * may or may not require fresh data each time. It may be killed between any two steps. A process that the
 * world leaves alone also stands for one that has nothing to do with the cache but got an updater's id.
 *
 * A pause is not a step, because the others may always be faster. All attempts to take a lock are one step:
 * it succeeds if the lock is free, and may give up if it is not. Taking a lock and the first read under it
 * are one step, and so are the last access and the release: nobody can tell the difference.
 *
 * With WITHIN the processes also call ReadWithin(). Its time may be over at any look, which ends it.
 *
 * Variants, each a -D. Conditions of the world:
 *   ID_ONLY            pid files hold no start time
 *   NO_KILLS           nobody is killed; idle processes may still end
 *   CERTAIN_LOCKS      nobody gives up on a lock
 *   LOCK_FAULTS        sometimes the lock file cannot be opened
 *   READ_FAULTS        sometimes the pid file cannot be opened for reading
 *   OUTSIDER           somebody removes the pid file by hand
 *   ONLY_OLD           data is refreshed only because it is old
 *   ONLY_MARKED        only a marked process writes the cache file
 *   ALL_BLOCK          all readers require fresh data
 *   WITHIN             process 1 reads by ReadWithin(), the others by that or by Read()
 *   ALL_WITHIN         all processes read by ReadWithin()
 *   PATIENT            nobody's time in ReadWithin() is ever over
 *   UNNOTICED_BIRTHS   a new process does not count as a disturbance of a lone reader
 * Changes of the protocol, which show that the checks can fail:
 *   NO_LOCK  SHARED_MARKING  NO_SECOND_LOOK  BLIND_REMOVAL  UNLOCKED_REMOVAL  NO_LIFE_CHECK
 *   WAIT_FOR_FRESH  WAIT_FOR_UPDATER  NO_LOOK_UNDER_LOCK  NO_CHECK_UNDER_LOCK  NO_TIME  STUBBORN_MARK
 * CHECK_... selects a property.
 */

#define Places 3 /* numbered from 1 */

#ifdef ALL_WITHIN
#define ReadsWithin
#endif
#ifdef WITHIN
#define ReadsWithin
#define MayCallRead(p) (p != 1)
#else
#define MayCallRead(p) true
#endif

/* The state of a process, in the order of the code. */
#define None 0         /* no process */
#define Rest 1         /* between two reads */
#define Update 2       /* found its data stale */
#define UpdateSeen 3   /*     has read the pid file under a shared lock, as in all states named ...Seen */
#define Wait 4         /* WaitForUpdater */
#define WaitSeen 5
#define Refresh 6      /* a child starts here */
#define RefreshSeen 7
#define Set 8          /* SetUpdating */
#define SetSeen 9      /*     exclusive lock held */
#define SetFree 10     /*     exclusive lock held, and nobody else refreshes */
#define Within 11      /* ClaimWithin */
#define WithinSeen 12  /*     has read the pid file without a lock */
#define Claim 13       /* TryClaim */
#define ClaimSeen 14   /*     exclusive lock held, as in the next two */
#define ClaimFree 15   /*     nobody else refreshes */
#define ClaimStale 16  /*     no fresh data has arrived */
#define Alone 17       /* RefreshWithin without a mark */
#define Produce 18     /* marked; DoUpdate */
#define Renew 19       /* marked; RefreshWithin */
#define Unset 20       /* UnsetUpdating */
#define End 21         /* EndClaim */
#define EndSeen 22     /*     has read the pid file without the lock, which could not be had */
#define EndRemove 23   /*     without the lock */
#define UnsetSeen 24
#define UnsetAgain 25  /*     a living process is marked; shared lock held */
#define UnsetRemove 26 /*     shared lock held */
#define HeldSeen 27    /* EndClaim; shared lock held */
#define HeldRemove 28  /*     shared lock held */

byte at[Places + 1];

/*
 * The id in the pid file: 0 for none; p for the process in place p, which may have ended; Places + p for an
 * earlier process with the same id as the one in place p; Gone for an id that no process has.
 */
#define Gone (2 * Places + 1)
byte mark;
byte seen[Places + 1]; /* what each process has read from it */

bit fresh;   /* the cache file is not older than the time-out */
bit retired; /* no process is started, killed or made to read any more */

#define Place(id) ((id) - Places * ((id) > Places)) /* without ?: because claims have none */
#define HasProcess(id) ((id) != 0 && (id) != Gone && at[Place(id)] != None)
#define IsOwners(id) ((id) != 0 && (id) <= Places && at[id] != None)
#define IsUpdater(p) (at[p] >= Produce)
#ifdef ID_ONLY
#define Counts(id) HasProcess(id)
#else
#define Counts(id) IsOwners(id)
#endif

/* The lock. Who holds it follows from the states. */
#define Marks(p) (at[p] == SetSeen || at[p] == SetFree || (at[p] >= ClaimSeen && at[p] <= ClaimStale))
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
/* A refresh starts only while data is old. */
#ifdef CHECK_NO_LATE_REFRESH
#define AssertNoLateRefresh assert(!fresh)
#else
#define AssertNoLateRefresh skip
#endif
/* An idle process has left no mark. */
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
/* A process that waited has fresh data. */
#ifdef CHECK_WAIT_BRINGS_FRESH
#define AssertWaitBroughtFresh assert(fresh)
#else
#define AssertWaitBroughtFresh skip
#endif
/* A process that does not refresh because another one does never returns with old data. */
#ifdef CHECK_LOSER_WAITS
#define AssertLoserWaits assert(fresh || !IsOwners(mark))
#else
#define AssertLoserWaits skip
#endif

/* The time of process 1 in ReadWithin(): over once this is true. */
#ifdef CHECK_ENDS_IN_TIME
bit late;
#define TimeIsLeft(p) (p != 1 || !late)
#define TimeBegins(p) late = (late && p != 1)
#else
#define TimeIsLeft(p) true
#define TimeBegins(p) skip
#endif
#ifdef ONLY_OLD
#define MayBeUnwanted false
#else
#define MayBeUnwanted true
#endif
#ifdef NO_LOOK_UNDER_LOCK
#define LooksUnderLock false
#else
#define LooksUnderLock true
#endif

/* Process 1 waits for a working updater until something is written or an updater ends. */
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
 * An undisturbed reader in place 1 finds no updater: all others have been idle since it started, and the
 * mark, if there was one, was not that of a living process.
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

/* A new process in place p: everybody who has read the last one's id there has a stale id. */
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

/* The lock ends with the process, its mark stays. */
inline Kill(p) {
    News;
    seen[p] = 0;
    at[p] = None
}

/* RefreshInChild, if there is a free place. */
inline Fork() {
    if
    :: at[1] == None -> Bear(1, Refresh)
    :: at[2] == None -> Bear(2, Refresh)
    :: at[3] == None -> Bear(3, Refresh)
    :: at[1] != None && at[2] != None && at[3] != None
    fi
}

/* CoreLibReadPidFile: reads the file, which is replaced as a whole, and ignores a reused id. */
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

/* CoreLibProcAlive, a step later: in between the process may end and its id be reused. */
#ifdef NO_LIFE_CHECK
#define SeenLives (seen[me] != 0)
#else
#define SeenLives HasProcess(seen[me])
#endif

inline GoTo(where) {
    seen[me] = 0;
    at[me] = where
}

/* The caller has its data. A child ends here, and other processes may. */
inline Finish() {
    seen[me] = 0;
    if
    :: AssertNoMarkStays; at[me] = Rest
    :: at[me] = None
    fi
}

/* Update, when another process refreshes: wait, or accept old data. */
inline MeetUpdater() {
    AssertNotLone;
    if
    :: AssertNoSelfWait; NoNews; GoTo(Wait)
#ifndef ALL_BLOCK
    :: Finish()
#endif
    fi
}

/* Update, when nobody refreshes: refresh, or let a child do it. */
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

/* ReadWithin, when another process refreshes or holds the lock: looks again. */
inline LookAgain() {
    AssertNotLone;
    GoTo(Within)
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
    :: atomic { at[me] == Produce -> at[me] = Unset } /* no data, or it could not be written */

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

#ifdef ReadsWithin
    :: atomic { at[me] == Within && fresh -> Finish() }
    :: atomic { at[me] == Within && (!fresh || MayBeUnwanted) && TimeIsLeft(me) ->
           ReadMark();
           at[me] = WithinSeen
       }
#ifndef NO_TIME
#ifndef PATIENT
    :: atomic { at[me] == Within -> Finish() }
#endif
#endif
    :: atomic { at[me] == WithinSeen && SeenLives -> LookAgain() }
    :: atomic { at[me] == WithinSeen && !SeenLives -> GoTo(Claim) }

    :: atomic { at[me] == Claim && MayExclude -> ReadMark(); at[me] = ClaimSeen }
    :: atomic { at[me] == Claim && !MayExclude -> LookAgain() }
#ifdef LOCK_FAULTS
    :: atomic { at[me] == Claim -> at[me] = Alone }
#endif
#ifdef NO_CHECK_UNDER_LOCK
    :: atomic { at[me] == ClaimSeen -> GoTo(ClaimFree) }
#else
    :: atomic { at[me] == ClaimSeen && SeenLives -> LookAgain() }
    :: atomic { at[me] == ClaimSeen && !SeenLives -> GoTo(ClaimFree) }
#endif
    :: atomic { at[me] == ClaimFree && fresh && LooksUnderLock -> Finish() }
    :: atomic { at[me] == ClaimFree && (!fresh || MayBeUnwanted || !LooksUnderLock) ->
           at[me] = ClaimStale
       }
    :: atomic {
           at[me] == ClaimStale -> AssertOneUpdater;
           AssertNoLateRefresh;
           mark = me;
           at[me] = Renew
       }
    :: atomic { at[me] == ClaimStale -> at[me] = Alone } /* the pid file cannot be written */
#ifndef ONLY_MARKED
    :: atomic { at[me] == Alone -> fresh = true; News; Finish() }
#endif
    :: atomic { at[me] == Alone -> Finish() } /* no data, or it could not be written */

    :: atomic { at[me] == Renew -> fresh = true; News; at[me] = End }
    :: atomic { at[me] == Renew -> at[me] = End }
    :: atomic { at[me] == End && MayShare -> ReadMark(); at[me] = HeldSeen }
#ifdef STUBBORN_MARK
    :: atomic { at[me] == End && GivesUp(MayShare) -> News; Finish() }
#else
    :: atomic { at[me] == End && GivesUp(MayShare) -> ReadMark(); at[me] = EndSeen }
#endif
    :: atomic { at[me] == HeldSeen && (Place(seen[me]) == me || !SeenLives) -> GoTo(HeldRemove) }
    :: atomic { at[me] == HeldSeen && Place(seen[me]) != me && SeenLives -> News; Finish() }
    :: atomic { at[me] == EndSeen && (Place(seen[me]) == me || !SeenLives) -> GoTo(EndRemove) }
    :: atomic { at[me] == EndSeen && Place(seen[me]) != me && SeenLives -> News; Finish() }
    :: atomic { at[me] == HeldRemove || at[me] == EndRemove -> RemoveMark() }
#endif
    od
}

#ifdef ONLY_OLD
#define MayRead !fresh
#else
#define MayRead true /* or the data is not valid, or Update() is called directly */
#endif
#ifdef NO_KILLS
#define MayEnd(p) (at[p] == Rest)
#else
#define MayEnd(p) (at[p] != None)
#endif

inline Disturb(p) {
    if
    :: at[p] == None -> Bear(p, Rest)
#ifndef ALL_WITHIN
    :: at[p] == Rest && MayRead && MayCallRead(p) -> BeginsToRead(p); at[p] = Update
#endif
#ifdef ReadsWithin
    :: at[p] == Rest && MayRead -> BeginsToRead(p); TimeBegins(p); at[p] = Within
#endif
    :: MayEnd(p) -> Kill(p)
    :: else
    fi
}

/* The world may retire at any time or never: nothing has to happen. */
active proctype World() {
    do
    :: atomic { true -> Disturb(1) }
    :: atomic { true -> Disturb(2) }
    :: atomic { true -> Disturb(3) }
    :: atomic { fresh -> fresh = false }
#ifndef ONLY_MARKED
    :: atomic { !fresh -> fresh = true; News } /* UpdateWithData(), called directly */
#endif
#ifdef OUTSIDER
    :: atomic { mark != 0 -> mark = 0 }
#endif
#ifdef CHECK_ENDS_IN_TIME
    :: atomic { at[1] == Within || at[1] == WithinSeen -> late = true }
#endif
    :: atomic { true -> retired = true; break }
    od
}

#define Ends [](at[1] > Rest -> <>(at[1] <= Rest)) /* every read of process 1 */

/* When the world has retired, and data is fresh or no updater is marked. */
#ifdef CHECK_READ_ENDS
ltl { (<>retired && <>[](fresh || !Counts(mark))) -> Ends }
#endif
/* However many processes start, are killed and read, when the lock is free and the marked id unused. */
#ifdef CHECK_READ_ENDS_IN_A_CROWD
ltl { <>[]((fresh || !HasProcess(mark)) && !Exclusive) -> Ends }
#endif
/* When the world has retired and nobody refreshes. */
#ifdef CHECK_READ_ENDS_WITH_REFRESHES
ltl { (<>retired && <>[](!IsUpdater(1) && !IsUpdater(2) && !IsUpdater(3))) -> Ends }
#endif
/* When data is fresh again and again, and the process checks again and again. */
#ifdef CHECK_READ_ENDS_BY_FRESH_MOMENTS
ltl { ([]<>fresh && []<>(at[1] == WaitSeen)) -> Ends }
#endif
/* ReadWithin() ends in its time, whatever the others do. */
#ifdef CHECK_ENDS_IN_TIME
ltl { [](late -> <>(at[1] <= Rest)) }
#endif

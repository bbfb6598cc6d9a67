// What is known of a refresh, put together from the answers that tell of it.

import { ApiError } from '../api/error';
import type { RefreshError, RefreshProgress } from '../api/types';

// The task that this window started, as "update_status" tells of it.
export type TaskState = { state: 'updating' } | { state: 'finish' } | { state: 'failed'; error: ApiError };

export interface Snapshot {
  progress: RefreshProgress | null;
  // Null: this window started none, or its record is gone.
  task: TaskState | null;
}

// A refresh from when it is first seen to its end. The appliance counts users and groups as two runs: they are one here.
export interface Run {
  // Seconds since 1970.
  since: number;
  errors: RefreshError[];
  // When the refresh before this one had started: what is told of that one is not of this. The two clocks may differ.
  stale: number | null;
}

export type Result =
  // By this window: did it work? By another: as far as one can tell.
  | { outcome: 'done'; at: number; errors: RefreshError[] }
  | { outcome: 'failed'; at: number; errors: RefreshError[]; error: ApiError }
  | { outcome: 'stopped'; at: number };

export interface Followed {
  running: Run | null;
  // Of the refresh that ended last while the page watched.
  result: Result | null;
}

export const kNothing: Followed = { running: null, result: null };

export const kTaskStopped = 121;

export function isRunning({ progress, task }: Snapshot): boolean {
  return task === null ? progress?.running === true : task.state === 'updating';
}

function joined(first: RefreshError[], second: RefreshError[]): RefreshError[] {
  const known = new Set(first.map((error) => `${error.kind} ${error.domain}`));
  return [...first, ...second.filter((error) => !known.has(`${error.kind} ${error.domain}`))];
}

// The next state after an answer. `now`: seconds since 1970.
export function follow(before: Followed, snapshot: Snapshot, now: number): Followed {
  const { progress, task } = snapshot;
  // A task that ended while nobody looked, as during a reload of the page, has had a run, too.
  const own = before.running ?? (task === null ? null : { since: now, errors: [], stale: null });
  const current =
    progress !== null && (progress.running || (own !== null && progress.started !== own.stale))
      ? progress
      : null;
  if (isRunning(snapshot)) {
    const since = Math.min(own?.since ?? now, current?.started ?? now);
    const errors = joined(own?.errors ?? [], current?.errors ?? []);
    return { running: { since, errors, stale: own?.stale ?? null }, result: null };
  }
  if (own === null) return before;
  const errors = joined(own.errors, current?.errors ?? []);
  if (task?.state === 'failed') {
    return {
      running: null,
      result:
        task.error.code === kTaskStopped
          ? { outcome: 'stopped', at: now }
          : { outcome: 'failed', at: now, errors, error: task.error },
    };
  }
  return { running: null, result: { outcome: 'done', at: now, errors } };
}

// How many of all lists are complete: of each domain the users, then of each the groups.
export function listsDone({ kind, domains, domains_done }: RefreshProgress): { done: number; all: number } {
  return { done: Math.min(domains_done, domains) + (kind === 'group' ? domains : 0), all: domains * 2 };
}

import { expect, it } from 'vitest';
import { ApiError } from '../api/error';
import type { RefreshError, RefreshProgress } from '../api/types';
import { choices } from './domains';
import { follow, kNothing, listsDone, type Snapshot } from './refresh';

const progress = (more: Partial<RefreshProgress> = {}): RefreshProgress => ({
  running: true,
  kind: 'user',
  domain: 'LAB',
  count: 1,
  domains_done: 0,
  domains: 2,
  started: 1000,
  updated: 1001,
  errors: [],
  ...more,
});
const failure = (domain: string, kind = 'user'): RefreshError => ({ domain, kind, reason: 'why' });
const all = (snapshots: [Snapshot, number][]) =>
  snapshots.reduce((before, [snapshot, now]) => follow(before, snapshot, now), kNothing);

it('takes users and groups for one run', () => {
  const state = all([
    [{ progress: progress({ errors: [failure('OTHER')] }), task: null }, 1005],
    [
      {
        progress: progress({ kind: 'group', started: 1010, errors: [failure('OTHER', 'group')] }),
        task: null,
      },
      1012,
    ],
  ]);
  expect(state.running).toMatchObject({ since: 1000, errors: [failure('OTHER'), failure('OTHER', 'group')] });
  const end = follow(state, { progress: progress({ running: false, started: 1010 }), task: null }, 1020);
  expect(end).toEqual({
    running: null,
    result: { outcome: 'done', at: 1020, errors: [failure('OTHER'), failure('OTHER', 'group')] },
  });
});

it('does not take the errors of an earlier refresh for those of this one, whatever the clocks say', () => {
  const old = progress({ running: false, started: 500, errors: [failure('OLD')] });
  const begun = { running: { since: 9000, errors: [], stale: 500 }, result: null };
  const state = follow(begun, { progress: old, task: { state: 'updating' } }, 9001);
  expect(state.running?.errors).toEqual([]);
  expect(follow(state, { progress: old, task: { state: 'finish' } }, 9002).result).toMatchObject({
    errors: [],
  });
  const ended = progress({ running: false, started: 600, errors: [failure('NEW')] });
  expect(follow(state, { progress: ended, task: { state: 'finish' } }, 9002).result).toMatchObject({
    errors: [failure('NEW')],
  });
});

it('tells of a task that ended while nobody looked', () => {
  const state = follow(kNothing, { progress: null, task: { state: 'finish' } }, 1000);
  expect(state).toEqual({ running: null, result: { outcome: 'done', at: 1000, errors: [] } });
});

it('tells a stop from a failure', () => {
  const task = (code: number): Snapshot => ({
    progress: null,
    task: { state: 'failed', error: new ApiError('answer', { code, status: 200 }) },
  });
  const started: [Snapshot, number] = [{ progress: null, task: { state: 'updating' } }, 1000];
  expect(all([started, [task(121), 1001]]).result?.outcome).toBe('stopped');
  expect(all([started, [task(120), 1001]]).result?.outcome).toBe('failed');
});

it('counts lists', () => {
  expect(listsDone(progress({ domains_done: 1 }))).toEqual({ done: 1, all: 4 });
  expect(listsDone(progress({ kind: 'group', domains_done: 1 }))).toEqual({ done: 3, all: 4 });
});

it('names each domain once, the own one first', () => {
  const lists = [{ domain: 'ZOO', kind: 'user', count: 1, fetched: 1 }] as const;
  expect(choices('LAB', lists, ['lab', 'Alpha', 'zoo'])).toEqual(['LAB', 'ALPHA', 'ZOO']);
});

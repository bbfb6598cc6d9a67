import { call } from '../api/client';
import { ApiError, codes } from '../api/error';
import { session } from '../api/session';
import { Store } from '../api/store';
import type { JoinSteps, LeaveParameters } from '../api/types';
import { parametersOf, type JoinForm } from './rules';

// A request on its way when the connection broke is at work by then, or never will be, in milliseconds.
const kBeginsWithin = 5000;

export type Action = 'join' | 'leave';

// A join or leave that was begun in this window. It outlives the dialog, as it goes on in the appliance whatever
// becomes of the dialog.
export type Job =
  | { state: 'idle' }
  | {
      state: 'running';
      action: Action;
      domain: string;
      // Milliseconds since 1970 by this browser's clock.
      begun: number;
      // The record of an earlier one, which is not this one's.
      earlier: string | null;
      // The call's answer was cut off: the record says when it has ended, and how.
      cutOff: boolean;
      // Leaving: the computer account, and whether it is deleted on the controller.
      account: string | null;
      deleted: boolean;
    }
  | {
      state: 'done';
      action: Action;
      domain: string;
      record: JoinSteps | null;
      account: string | null;
      deleted: boolean;
    }
  | { state: 'failed'; action: Action; domain: string; record: JoinSteps | null; error: unknown };

export const job = new Store<Job>({ state: 'idle' });

// What the dialog held, without the password, so that it can be corrected.
export const lastForm = new Store<JoinForm | null>(null);

// Changes whenever the membership may be another one.
export const membershipChanges = new Store(0);

function changed(): void {
  membershipChanges.set(membershipChanges.get() + 1);
}

export function forgetJob(): void {
  if (job.get().state !== 'running') job.set({ state: 'idle' });
}

// Whoever logs in next is told by the appliance itself what runs.
session.subscribe(() => {
  if (session.get().state === 'active') return;
  job.set({ state: 'idle' });
  lastForm.set(null);
});

export function startJoin(form: JoinForm): Promise<void> {
  lastForm.set({ ...form, password: '' });
  return run('join', form.domain.trim(), null, false, () => call('domain.set', parametersOf(form)));
}

export function startLeave(
  domain: string,
  account: string | null,
  parameters: LeaveParameters,
): Promise<void> {
  return run('leave', domain, account, parameters.delete_account, () => call('directory.leave', parameters));
}

async function run(
  action: Action,
  domain: string,
  account: string | null,
  deleted: boolean,
  act: () => Promise<null>,
): Promise<void> {
  if (job.get().state === 'running') return;
  job.set({
    state: 'running',
    action,
    domain,
    begun: Date.now(),
    earlier: null,
    cutOff: false,
    account,
    deleted,
  });
  try {
    const before = await call('directory.join_steps', {});
    // Before the call: the dialog must not show the earlier one's steps.
    follow({ earlier: before?.id ?? null });
  } catch (error) {
    // Nothing has been begun yet.
    end({ state: 'failed', action, domain, record: null, error });
    return;
  }
  try {
    await act();
    end({ state: 'done', action, domain, record: await recordOf(action), account, deleted });
  } catch (error) {
    if (isCutOff(error)) {
      cutOffSince = Date.now();
      follow({ cutOff: true });
    } else end({ state: 'failed', action, domain, record: await recordOf(action), error });
  }
}

// Did the answer get lost, rather than the appliance refuse?
function isCutOff(error: unknown): boolean {
  return error instanceof ApiError && (error.kind !== 'answer' || error.code === codes.serverSilent);
}

let cutOffSince = 0;

function follow(what: { earlier?: string | null; cutOff?: boolean }): void {
  const now = job.get();
  if (now.state === 'running') job.set({ ...now, ...what });
}

function end(result: Job): void {
  // The session may have ended meanwhile, and the job been forgotten.
  if (job.get().state === 'running') job.set(result);
  changed();
}

// The record of the job that has just ended, unless there is none: then it failed before anything was done.
async function recordOf(action: Action): Promise<JoinSteps | null> {
  const now = job.get();
  const earlier = now.state === 'running' ? now.earlier : null;
  try {
    const record = await call('directory.join_steps', {}, { background: true });
    return record !== null && record.action === action && record.id !== earlier ? record : null;
  } catch {
    return null;
  }
}

// What the appliance's record says, for a job whose answer was cut off. `busy`: whether the appliance is at it still.
export function settle(record: JoinSteps | null, busy: boolean): void {
  const now = job.get();
  if (now.state !== 'running' || !now.cutOff) return;
  const own = record !== null && record.id !== now.earlier && record.action === now.action ? record : null;
  if (own !== null && own.finished !== null) {
    const { action, domain, account, deleted } = now;
    if (own.success === true) end({ state: 'done', action, domain, record: own, account, deleted });
    else end({ state: 'failed', action, domain, record: own, error: undefined });
  } else if (own === null && !busy && Date.now() - cutOffSince > kBeginsWithin) {
    end({ state: 'failed', action: now.action, domain: now.domain, record: null, error: undefined });
  }
}

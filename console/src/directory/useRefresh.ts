import { useEffect, useRef, useState } from 'react';
import { call, type CallOptions } from '../api/client';
import { ApiError, codes } from '../api/error';
import { useCall, usePoll } from '../ui';
import {
  follow,
  isRunning,
  kNothing,
  kTaskStopped,
  type Followed,
  type Snapshot,
  type TaskState,
} from './refresh';

// Milliseconds between two looks: while a refresh runs, and in case that another starts one.
const kRunning = 1000;
const kIdle = 3000;
// How long a stop may take until it is said that the refresh goes on, and the pause between two looks.
const kStopWait = 6000;
const kStopPause = 300;
// The task's record is gone.
const kTasksUnreadable = 117;
const kTaskKey = 'vorn-refresh';

// The task outlives a reload of the page.
function rememberTask(task: string | null): void {
  try {
    if (task === null) window.sessionStorage.removeItem(kTaskKey);
    else window.sessionStorage.setItem(kTaskKey, task);
  } catch {
    // Storage may be switched off: a reload then follows the refresh without its result code.
  }
}

function rememberedTask(): string | null {
  try {
    return window.sessionStorage.getItem(kTaskKey);
  } catch {
    return null;
  }
}

async function taskState(task: string, options: CallOptions): Promise<TaskState | null> {
  try {
    const { status } = await call('domain.update_status', { task_id: task }, options);
    return { state: status };
  } catch (error) {
    if (!(error instanceof ApiError) || error.kind !== 'answer' || error.status !== 200) throw error;
    return error.code === kTasksUnreadable ? null : { state: 'failed', error };
  }
}

async function look(task: string | null, { signal }: CallOptions): Promise<Snapshot> {
  // By itself, always: watching does not keep a session alive.
  const options: CallOptions = { background: true, ...(signal === undefined ? {} : { signal }) };
  const [progress, state] = await Promise.all([
    call('directory.refresh_progress', {}, options),
    task === null ? null : taskState(task, options),
  ]);
  return { progress, task: state };
}

const pause = (milliseconds: number) => new Promise((resolve) => setTimeout(resolve, milliseconds));
const seconds = () => Math.floor(Date.now() / 1000);

export type StopResult = 'stopped' | 'ended' | 'goesOn';

// A refresh that runs, whoever started it, and what became of the last one.
export function useRefresh(enabled: boolean, onEnd: () => void) {
  const [task, setTask] = useState<string | null>(rememberedTask);
  const [followed, setFollowed] = useState<Followed>(kNothing);
  // Another's was running when one was to be started.
  const [joinedIn, setJoinedIn] = useState(false);
  const running = followed.running !== null;
  const latestEnd = useRef(onEnd);
  latestEnd.current = onEnd;

  const polled = usePoll((options) => look(task, options), `refresh ${task}`, {
    every: running ? kRunning : kIdle,
    enabled,
    keep: true,
  });
  const snapshot = polled.data;

  useEffect(() => {
    if (snapshot !== undefined) setFollowed((before) => follow(before, snapshot, seconds()));
    // The end of the task is told once.
    if (snapshot !== undefined && task !== null && !isRunning(snapshot)) {
      rememberTask(null);
      setTask(null);
    }
    // eslint-disable-next-line react-hooks/exhaustive-deps -- an answer is of the task that was asked about
  }, [snapshot]);

  const ran = useRef(false);
  useEffect(() => {
    if (ran.current && !running) {
      setJoinedIn(false);
      latestEnd.current();
    }
    ran.current = running;
  }, [running]);

  const start = useCall(async (domain: string | null) => {
    stop.reset();
    setJoinedIn(false);
    try {
      const { task_id: id } = await call(
        'domain.update_start',
        domain === null ? {} : { domain_name: domain },
      );
      rememberTask(id);
      setFollowed({
        running: { since: seconds(), errors: [], stale: snapshot?.progress?.started ?? null },
        result: null,
      });
      setTask(id);
    } catch (error) {
      if (!(error instanceof ApiError) || error.code !== codes.refreshRunning) throw error;
      setJoinedIn(true);
      polled.reload();
    }
  });

  const stop = useCall(async (): Promise<StopResult> => {
    await call('domain.update_stop', {});
    const end = Date.now() + kStopWait;
    for (;;) {
      const now = await look(task, {});
      if (!isRunning(now)) {
        polled.reload();
        const stopped =
          now.task === null || (now.task.state === 'failed' && now.task.error.code === kTaskStopped);
        return stopped ? 'stopped' : 'ended';
      }
      if (Date.now() > end) return 'goesOn';
      await pause(kStopPause);
    }
  });

  return {
    ...followed,
    progress: snapshot?.progress ?? null,
    // Not known yet, or not any more.
    error: polled.error,
    retry: polled.reload,
    joinedIn,
    start,
    stop,
  };
}

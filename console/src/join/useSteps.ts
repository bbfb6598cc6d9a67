import { useEffect } from 'react';
import { call } from '../api/client';
import { useStore } from '../api/store';
import type { JoinSteps } from '../api/types';
import { usePoll } from '../ui';
import { job, settle } from './job';

const kEvery = 1000;

// The steps of the job that runs, asked for each second; null until its first one is known.
export function useSteps(active: boolean): JoinSteps | null {
  const now = useStore(job);
  const cutOff = now.state === 'running' && now.cutOff;
  const { data, updated } = usePoll(
    async (options) => {
      const record = await call('directory.join_steps', {}, options);
      // Whether the appliance is at it still matters only when the answer can't come any more.
      const busy = !cutOff || (await call('directory.overview', {}, options)).busy !== null;
      return { record, busy, cutOff };
    },
    `steps ${cutOff}`,
    { every: kEvery, enabled: active, keep: true },
  );
  useEffect(() => {
    if (data?.cutOff) settle(data.record, data.busy);
  }, [data, updated]);

  const record = data?.record ?? null;
  if (record === null) return null;
  return now.state === 'running' && record.id === now.earlier ? null : record;
}

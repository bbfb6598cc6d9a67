import { call, type CallOptions } from '../api/client';
import { toSchedule, type Schedule } from '../rules/schedule';
import { clockOf, type Clock } from '../rules/scheduleRuns';

export interface Stored {
  member: boolean;
  schedule: Schedule;
  clock: Clock;
}

export async function readStored(options: CallOptions = {}): Promise<Stored> {
  const [domain, schedule, overview] = await Promise.all([
    call('domain.get', {}, options),
    call('schedule.get', {}, options),
    call('directory.overview', {}, options),
  ]);
  return {
    member: domain.enable_domain,
    schedule: toSchedule({ ...schedule }),
    clock: clockOf(overview.clock, Date.now()),
  };
}

import { call, type CallOptions } from '../api/client';
import { toSchedule, type Schedule } from '../rules/schedule';

export interface Stored {
  member: boolean;
  schedule: Schedule;
}

export async function readStored(options: CallOptions = {}): Promise<Stored> {
  const [domain, schedule] = await Promise.all([
    call('domain.get', {}, options),
    call('schedule.get', {}, options),
  ]);
  return { member: domain.enable_domain, schedule: toSchedule({ ...schedule }) };
}

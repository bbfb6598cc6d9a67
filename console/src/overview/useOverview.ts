import { useEffect } from 'react';
import { call } from '../api/client';
import { useStore } from '../api/store';
import type { DomainState, KnownList, Overview } from '../api/types';
import { job, membershipChanges } from '../join/job';
import { hostName } from '../shell/hostName';
import { usePoll, type Polled } from '../ui';

const kEvery = 5000;
const kSoon = 2000;
// The membership changes by a join or leave, of which the overview tells; this is for what tools change behind its back.
const kSeldom = 30_000;

export interface OverviewData {
  overview: Polled<Overview>;
  domain: Polled<DomainState>;
  lists: Polled<{ domains: KnownList[] }>;
  // A join or leave that runs, whoever began it.
  busy: 'join' | 'leave' | null;
}

// All that the overview shows, kept fresh.
export function useOverview(): OverviewData {
  const own = useStore(job);
  const changes = useStore(membershipChanges);
  const overview = usePoll((options) => call('directory.overview', {}, options), `overview ${changes}`, {
    every: own.state === 'running' ? kSoon : kEvery,
    keep: true,
  });
  const busy = own.state === 'running' ? own.action : (overview.data?.busy ?? null);
  // What was true before or during another's join or leave is asked anew after it.
  const account = overview.data?.computer_account ?? '';
  const known = overview.data && `${busy ?? ''} ${account}`;
  const domain = usePoll((options) => call('domain.get', {}, options), `domain ${changes}`, {
    every: kSeldom,
    keep: true,
    known,
  });
  const refreshed = overview.data?.refresh?.finished ?? 0;
  const lists = usePoll((options) => call('directory.domains', {}, options), `lists ${changes}`, {
    every: kSeldom,
    keep: true,
    known: known && `${known} ${refreshed}`,
  });

  const name = overview.data?.host_name;
  useEffect(() => {
    if (name !== undefined) hostName.set(name);
  }, [name]);
  return { overview, domain, lists, busy };
}

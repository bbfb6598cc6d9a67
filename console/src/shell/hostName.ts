import { useEffect } from 'react';
import { call } from '../api/client';
import { connection } from '../api/connection';
import { Store, useStore } from '../api/store';
import { session } from '../api/session';

// The appliance's name, once it is known; the overview's polls keep it true.
export const hostName = new Store<string | null>(null);

// Asks for the name when nobody has yet.
export function useHostName(): string | null {
  const name = useStore(hostName);
  const lost = useStore(connection).state === 'lost';
  const active = useStore(session).state === 'active';
  useEffect(() => {
    if (name !== null || lost || !active) return;
    const stop = new AbortController();
    call('directory.overview', {}, { signal: stop.signal, background: true })
      .then((overview) => hostName.set(overview.host_name))
      .catch(() => {
        // The title goes without it; the view shows what is wrong.
      });
    return () => stop.abort();
  }, [name, lost, active]);
  return name;
}

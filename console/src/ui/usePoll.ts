import { useCallback, useEffect, useRef, useState } from 'react';
import type { CallOptions } from '../api/client';
import { connection } from '../api/connection';
import { ApiError, isAbort } from '../api/error';
import { useStore } from '../api/store';

export interface Polled<T> {
  // The last answer, kept while newer ones are asked for and when one fails.
  data: T | undefined;
  error: unknown;
  // True until the first answer or failure for the present key.
  loading: boolean;
  // True while any request runs.
  busy: boolean;
  // When `data` came, in milliseconds since 1970.
  updated: number | null;
  // Asks again now; counts as an act of the administrator.
  reload: () => void;
}

export interface PollOptions {
  // Milliseconds from an answer to the next request; absent or null: asked once.
  every?: number | null;
  enabled?: boolean;
  // Keep showing the last answer when the key changes (a next page of a list), rather than nothing.
  keep?: boolean;
  // What else is known of the matter, such as by another poll: asked anew when it changes, which is no act of the
  // administrator. Absent or null while nothing is known; what is known first changes nothing.
  known?: string | null | undefined;
}

// Loads with `load` when the view appears and whenever `key` changes, then again and again if wanted. A request of an
// earlier key is given up. What it asks by itself doesn't keep the session alive. Repeats rest while the window is
// hidden; when the connection comes back the question is asked anew.
export function usePoll<T>(
  load: (options: CallOptions) => Promise<T>,
  key: string,
  { every = null, enabled = true, keep = false, known = null }: PollOptions = {},
): Polled<T> {
  const [state, setState] = useState<{
    key: string;
    data: T | undefined;
    error: unknown;
    updated: number | null;
  }>({
    key,
    data: undefined,
    error: undefined,
    updated: null,
  });
  const [busy, setBusy] = useState(false);
  const [round, setRound] = useState(0);
  const lost = useStore(connection).state === 'lost';
  const latest = useRef(load);
  latest.current = load;
  const repeats = every !== null;
  const period = useRef(every);
  period.current = every;
  const wasLost = useRef(false);
  const firstKnown = useRef(known);
  firstKnown.current ??= known;
  const news = known === firstKnown.current ? null : known;
  // The last question that was an act of the administrator.
  const act = useRef('');

  useEffect(() => {
    if (lost) wasLost.current = true;
    if (!enabled || lost) return;
    const thisAct = `${round} ${key}`;
    const byItself = wasLost.current || act.current === thisAct;
    act.current = thisAct;
    const stop = new AbortController();
    let timer: ReturnType<typeof setTimeout> | null = null;

    const ask = async (background: boolean) => {
      timer = null;
      setBusy(true);
      try {
        const data = await latest.current({ signal: stop.signal, background });
        if (stop.signal.aborted) return;
        setState({ key, data, error: undefined, updated: Date.now() });
      } catch (error) {
        if (stop.signal.aborted || isAbort(error)) return;
        // The banner says so, and the question is asked anew when the appliance is back.
        if (error instanceof ApiError && error.lost) return;
        setState((before) => ({
          key,
          data: before.key === key || keep ? before.data : undefined,
          error,
          updated: before.updated,
        }));
      }
      setBusy(false);
      plan();
    };
    const plan = () => {
      if (period.current === null || stop.signal.aborted) return;
      timer = setTimeout(() => {
        if (document.visibilityState === 'hidden') plan();
        else void ask(true);
      }, period.current);
    };

    void ask(byItself);
    wasLost.current = false;
    return () => {
      stop.abort();
      if (timer !== null) clearTimeout(timer);
      setBusy(false);
    };
    // `every` going from null to a number must start the repeats.
  }, [key, enabled, keep, lost, round, repeats, news]);

  const current = state.key === key;
  const data = current || keep ? state.data : undefined;
  const error = current ? state.error : undefined;
  return {
    data,
    error,
    loading: enabled && data === undefined && error === undefined,
    busy,
    updated: state.updated,
    reload: useCallback(() => setRound((before) => before + 1), []),
  };
}

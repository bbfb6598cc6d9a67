import { useCallback, useEffect, useRef, useState } from 'react';
import { isAbort } from '../api/error';

export interface Act<A extends unknown[], T> {
  // Runs it; while it runs, further calls do nothing. Gives back what it answered, or undefined when it failed or
  // was running already.
  run: (...parameters: A) => Promise<T | undefined>;
  busy: boolean;
  data: T | undefined;
  error: unknown;
  // Forgets the result and the error.
  reset: () => void;
}

// An act of the administrator that must not run twice at a time, such as the click on a button.
export function useCall<A extends unknown[], T>(act: (...parameters: A) => Promise<T>): Act<A, T> {
  const [state, setState] = useState<{ busy: boolean; data: T | undefined; error: unknown }>({
    busy: false,
    data: undefined,
    error: undefined,
  });
  // Not the state: two clicks may come before React draws once.
  const running = useRef(false);
  const mounted = useRef(true);
  const latest = useRef(act);
  latest.current = act;
  useEffect(() => {
    mounted.current = true;
    return () => {
      mounted.current = false;
    };
  }, []);

  const run = useCallback(async (...parameters: A): Promise<T | undefined> => {
    if (running.current) return undefined;
    running.current = true;
    setState((before) => ({ ...before, busy: true, error: undefined }));
    try {
      const data = await latest.current(...parameters);
      if (mounted.current) setState({ busy: false, data, error: undefined });
      return data;
    } catch (error) {
      if (mounted.current)
        setState({ busy: false, data: undefined, error: isAbort(error) ? undefined : error });
      return undefined;
    } finally {
      running.current = false;
    }
  }, []);
  const reset = useCallback(
    () => setState((before) => ({ busy: before.busy, data: undefined, error: undefined })),
    [],
  );
  return { run, busy: state.busy, data: state.data, error: state.error, reset };
}

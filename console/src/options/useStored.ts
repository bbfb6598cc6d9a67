import { useCallback, useRef, useState } from 'react';
import type { CallOptions } from '../api/client';
import { usePoll } from '../ui';

// How soon a change that was made elsewhere is seen, in milliseconds.
const kLook = 10_000;

// What is stored on the appliance and edited here: read now and again, and replaced by what a save has read.
export function useStored<T>(key: string, load: (options: CallOptions) => Promise<T>) {
  const newest = useRef<{ value: T; at: number } | null>(null);
  const [, setRound] = useState(0);
  const polled = usePoll(
    async (options: CallOptions) => {
      const began = Date.now();
      const value = await load(options);
      // An answer on its way while something was saved may tell of the time before.
      if (newest.current !== null && newest.current.at >= began) return newest.current.value;
      newest.current = null;
      return value;
    },
    key,
    { every: kLook },
  );
  const onStored = useCallback((value: T) => {
    newest.current = { value, at: Date.now() };
    setRound((before) => before + 1);
  }, []);
  const stored = newest.current?.value ?? polled.data;
  return { ...polled, loading: polled.loading && stored === undefined, stored, onStored };
}

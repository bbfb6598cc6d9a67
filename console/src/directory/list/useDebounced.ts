import { useEffect, useState } from 'react';

// The value as it was when it last rested for `pause` milliseconds.
export function useDebounced<T>(value: T, pause: number): T {
  const [settled, setSettled] = useState(value);
  useEffect(() => {
    const timer = setTimeout(() => setSettled(value), pause);
    return () => clearTimeout(timer);
  }, [value, pause]);
  return settled;
}

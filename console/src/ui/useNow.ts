import { useEffect, useState } from 'react';

// The present time in milliseconds, anew every `every` milliseconds while `active`.
export function useNow(every: number, active = true): number {
  const [now, setNow] = useState(() => Date.now());
  useEffect(() => {
    if (!active) return;
    setNow(Date.now());
    const timer = setInterval(() => setNow(Date.now()), every);
    return () => clearInterval(timer);
  }, [every, active]);
  return now;
}

import { Loading, useNow } from '../ui';
import type { JoinSteps } from '../api/types';
import { formatDuration, t } from '../texts';
import { StepList } from './StepList';
import { stepName } from './stepName';

interface RunningProps {
  action: 'join' | 'leave';
  domain: string;
  // Milliseconds since 1970.
  begun: number;
  record: JoinSteps | null;
  cutOff?: boolean;
  // In a dialog, which can be closed meanwhile; else the heading above says what runs.
  inDialog?: boolean;
}

// A join or leave while it runs: the time that has passed and the steps so far. Each new step is read out.
export function Running({ action, domain, begun, record, cutOff = false, inDialog = true }: RunningProps) {
  const now = useNow(1000);
  const steps = record?.steps ?? [];
  const last = steps.at(-1);
  const elapsed = Math.max(0, Math.floor((now - begun) / 1000) * 1000);
  return (
    <div className="vorn-running">
      <Loading inline patient text={inDialog ? t(`${action}.running`, { domain }) : t('join.inProgress')} />
      <p>
        {cutOff ? `${t(`${action}.cutOff`)} ` : inDialog && `${t(`${action}.stays`)} `}
        <span className="vorn-running__time">{t('join.elapsed', { time: formatDuration(elapsed) })}</span>
      </p>
      <p className="pf-v6-screen-reader" role="status">
        {last === undefined
          ? t(`${action}.starting`)
          : t('steps.now', { number: steps.length, name: stepName(last.name) })}
      </p>
      {steps.length > 0 && <StepList steps={steps} />}
    </div>
  );
}

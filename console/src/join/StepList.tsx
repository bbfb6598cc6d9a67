import CheckCircleIcon from '@patternfly/react-icons/dist/esm/icons/check-circle-icon';
import ExclamationCircleIcon from '@patternfly/react-icons/dist/esm/icons/exclamation-circle-icon';
import InProgressIcon from '@patternfly/react-icons/dist/esm/icons/in-progress-icon';
import MinusCircleIcon from '@patternfly/react-icons/dist/esm/icons/minus-circle-icon';
import type { ComponentType } from 'react';
import type { JoinStep, StepOutcome } from '../api/types';
import { formatDuration, t } from '../texts';
import { stepName } from './stepName';
import './steps.css';

const icons: Record<StepOutcome, ComponentType> = {
  ok: CheckCircleIcon,
  failed: ExclamationCircleIcon,
  running: InProgressIcon,
  skipped: MinusCircleIcon,
};

// The steps of a join or leave: what was done, which server was asked, what came of it, and how long it took.
export function StepList({ steps }: { steps: JoinStep[] }) {
  if (steps.length === 0) return <p>{t('steps.none')}</p>;
  return (
    <ol className="vorn-steps" aria-label={t('steps.title')}>
      {steps.map((step, index) => {
        const Icon = icons[step.outcome];
        return (
          <li key={index} className={`vorn-step vorn-step--${step.outcome}`}>
            <span className="vorn-step__icon" aria-hidden="true">
              <Icon />
            </span>
            <span className="vorn-step__words">
              <span className="vorn-step__name">{stepName(step.name)}</span>
              <span className="vorn-step__outcome">
                {t(`steps.${step.outcome}`)}
                {step.outcome !== 'running' &&
                  step.outcome !== 'skipped' &&
                  `, ${formatDuration(step.milliseconds)}`}
              </span>
              {(step.server !== '' || step.detail !== '') && (
                <span className="vorn-step__detail">
                  {step.server !== '' && <code>{step.server}</code>}
                  {step.detail !== '' && <span>{step.detail}</span>}
                </span>
              )}
            </span>
          </li>
        );
      })}
    </ol>
  );
}
